// The environment service: turns paths as users write them in filter parameters ("~/luts/a.cube",
// "${PROJECT}/grade.3dl") into file-system paths.
//
// It keeps no state and reads the environment only through getenv, so one instance serves every
// thread of the process.

#include <cstdlib>
#include <cstring>
#include <cwchar>
#include <string>

#include "HostInternal.h"
#include "Utf8.h"

namespace tfx::host {
namespace {

// Variable names are taken as the shell takes them, ASCII only: the environment is narrow, and
// a name with other characters could not be looked up anyway.
bool IsNameChar(wchar_t c) {
  return (c >= L'a' && c <= L'z') || (c >= L'A' && c <= L'Z') || (c >= L'0' && c <= L'9') ||
         c == L'_';
}

// The value of a variable as wide text; empty when unset. Values are taken to be UTF-8, which
// is what a desktop session exports whatever the process's own locale.
void AppendVariable(std::wstring& out, const wchar_t* name, size_t length) {
  std::string narrow(length, '\0');
  for (size_t i = 0; i < length; ++i) narrow[i] = static_cast<char>(name[i]);
  const char* value = std::getenv(narrow.c_str());
  if (value) out += DecodeUtf8(value, std::strlen(value));
}

std::wstring Translate(const wchar_t* path) {
  const size_t n = std::wcslen(path);
  std::wstring out;
  out.reserve(n);
  size_t i = 0;
  if (path[0] == L'~' && (path[1] == L'\0' || path[1] == L'/')) {
    AppendVariable(out, L"HOME", 4);
    i = 1;
  }
  while (i < n) {
    if (path[i] != L'$') {
      out += path[i++];
      continue;
    }
    const wchar_t next = path[i + 1];  // the terminating zero at the end of the path
    if (next == L'$') {
      out += L'$';
      i += 2;
      continue;
    }
    if (next == L'{') {
      size_t end = i + 2;
      while (end < n && IsNameChar(path[end])) ++end;
      if (end > i + 2 && path[end] == L'}') {
        AppendVariable(out, path + i + 2, end - (i + 2));
        i = end + 1;
      } else {
        // Unterminated or not a name: the "${" stays, and what follows is read as usual.
        out += L"${";
        i += 2;
      }
      continue;
    }
    size_t end = i + 1;
    while (end < n && IsNameChar(path[end])) ++end;
    if (end > i + 1) {
      AppendVariable(out, path + i + 1, end - (i + 1));
    } else {
      out += L'$';  // a lone "$" is an ordinary character
    }
    i = end;
  }
  return out;
}

class Environment final : public scombase::CUnknown, public INLEEnviroment {
 public:
  explicit Environment(IUnknown* outer) : CUnknown(L"NLEEnviroment", outer) {}

  NLE_DECLARE_IUNKNOWN

  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override {
    if (!out) return NLE_E_POINTER;
    if (iid == IID_INLEEnviroment) return GetInterface(static_cast<INLEEnviroment*>(this), out);
    return CUnknown::NonDelegatingQueryInterface(iid, out);
  }

  HRESULT TranslatePath(const wchar_t* path, wchar_t* out, uint32_t capacity,
                        uint32_t* needed) override {
    if (!path) return NLE_E_INVALIDARG;
    if (!out && capacity > 0) return NLE_E_POINTER;
    if (out && capacity > 0) out[0] = L'\0';
    return CallGuarded([&] {
      const std::wstring result = Translate(path);
      if (needed) {
        *needed = result.size() > UINT32_MAX ? UINT32_MAX : static_cast<uint32_t>(result.size());
      }
      // A cut path would name a different file, so a short buffer gets nothing but the size.
      if (result.size() >= capacity) return NLE_E_OUTOFMEMORY;
      std::wmemcpy(out, result.c_str(), result.size() + 1);
      return NLE_S_OK;
    });
  }
};

}  // namespace

scombase::CUnknown* NewEnvironment(IUnknown* outer) { return new Environment(outer); }

INLEEnviroment* SharedEnvironment() {
  // Created on first use and deliberately never destroyed: plug-ins may still translate paths
  // from their own static destructors. The reference taken here is never given back.
  static Environment* const shared = [] {
    auto* env = new Environment(nullptr);
    env->NonDelegatingAddRef();
    return env;
  }();
  return shared;
}

}  // namespace tfx::host
