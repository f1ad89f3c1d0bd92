// The tool's commands. Each gets the words after its name, with the global options removed, and
// reports failure through its Status; main prints it.
#pragma once

#include <string>
#include <vector>

#include "Status.h"
#include "plugin/PluginLibrary.h"

namespace tfxtool {

struct GlobalOptions {
  std::string pluginPath;  // --plugin; empty: the usual search
  bool noOpenCL = false;   // --no-opencl: nothing in this run touches the OpenCL runtime
};

using Args = std::vector<std::string>;

Status ListCommand(const GlobalOptions& options, const Args& args);
Status ApplyCommand(const GlobalOptions& options, const Args& args);
Status FxCommand(const GlobalOptions& options, const Args& args);
Status DemoCommand(const GlobalOptions& options, const Args& args);
Status LutCommand(const GlobalOptions& options, const Args& args);
Status DevicesCommand(const GlobalOptions& options, const Args& args);

// An option word, as opposed to a value: "-p", "--json", but not "-20" or "-.5", which are
// negative numbers given as arguments.
bool IsOptionWord(const std::string& word);

// If args[*i] is the option `name` (as "--name VALUE" or "--name=VALUE", or `shortName` followed by
// a value), stores its value, moves *i to the option's last word and returns true. A missing
// value sets *error instead.
bool TakeOptionValue(const Args& args, size_t* i, const char* name, const char* shortName,
                     std::string* value, Status* error);

}  // namespace tfxtool
