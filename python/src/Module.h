// What the parts of the module share: its exceptions and the one loaded plug-in.
#pragma once

#include <pybind11/pybind11.h>

#include <cstdint>
#include <string>

#include "Status.h"
#include "plugin/PluginLibrary.h"

namespace tfxpy {

namespace py = pybind11;

// Which of the module's exception classes a failure becomes: Error for what the library or the
// system refused, ParameterError (also a ValueError) for names and values the caller gave,
// LutError for LUT files.
enum class ErrorKind { kError, kParameter, kLut };

// Thrown anywhere in the module, with or without the GIL; translated into the Python class of
// its kind once the GIL is back, carrying the library's result code.
struct ModuleError {
  ErrorKind kind;
  std::string message;
  uint32_t code;
};

[[noreturn]] void Throw(const tfxtool::Status& status, ErrorKind kind);
inline void Check(const tfxtool::Status& status, ErrorKind kind) {
  if (!status.ok()) Throw(status, kind);
}

// Creates the exception classes in `module` and translates ModuleError into them.
void RegisterErrors(py::module_& module);

// The plug-in the module links, loaded through its entry points as any host loads it; loaded
// on first use and never unloaded.
const tfxtool::PluginLibrary& Plugin();

void RegisterFilters(py::module_& module);
void RegisterFunctions(py::module_& module);
void RegisterLuts(py::module_& module);

}  // namespace tfxpy
