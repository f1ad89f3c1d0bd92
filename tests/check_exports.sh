#!/usr/bin/env bash
# The plug-in publishes its three entry points and the documented image functions; everything
# else stays hidden so that hosts never bind to internals. Usage: check_exports.sh LIB ALLOWED
set -euo pipefail
lib=$1
allowed=$2

# Weak instantiations of standard-library templates (a std::vector growing inside a published
# member) come out with default visibility, which libstdc++ declares for namespace std; they are
# the standard library's, merge with the host's copies, and are not part of what we publish.
exported=$(nm -D --defined-only "$lib" | awk '$2 ~ /^[TDBRVWi]$/ {print $2, $3}' |
  while read -r kind name; do
    demangled=$(c++filt "$name")
    if [[ $kind == W && $demangled =~ ^(void\ )?std:: ]]; then continue; fi
    echo "$demangled"
  done | grep -v -E '^(_init|_fini|_edata|_end|__bss_start)$' | sort -u)

status=0
for entry in GetFilterCount GetFilterProperties CreateFilterFromGUID; do
  grep -qx "$entry" <<<"$exported" || { echo "missing C entry point: $entry"; status=1; }
done
unexpected=$(grep -v -E -f "$allowed" <<<"$exported" || true)
if [ -n "$unexpected" ]; then
  echo "symbols exported but not published:"
  echo "$unexpected"
  status=1
fi
[ $status -eq 0 ] && echo "exports ok: $(wc -l <<<"$exported") symbols"
exit $status
