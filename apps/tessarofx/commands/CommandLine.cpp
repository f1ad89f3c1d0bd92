#include <cctype>
#include <cstring>

#include "commands/Commands.h"

namespace tfxtool {

bool IsOptionWord(const std::string& word) {
  if (word.size() < 2 || word[0] != '-') return false;
  const unsigned char next = static_cast<unsigned char>(word[1]);
  return !std::isdigit(next) && next != '.';
}

bool TakeOptionValue(const Args& args, size_t* i, const char* name, const char* shortName,
                     std::string* value, Status* error) {
  const std::string& word = args[*i];
  const size_t n = std::strlen(name);
  if (word.size() > n && word.compare(0, n, name) == 0 && word[n] == '=') {
    *value = word.substr(n + 1);
    return true;
  }
  if (word != name && !(shortName && word == shortName)) return false;
  if (*i + 1 >= args.size()) {
    *error = Status::Error(word + " needs a value");
    return false;
  }
  ++*i;
  *value = args[*i];
  return true;
}

}  // namespace tfxtool
