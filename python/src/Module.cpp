// tessarofx._native: the compiled half of the tessarofx package. The package's Python half names
// things and turns keyword arguments into settings; everything that touches pixels is here.
#include "Module.h"

#include <dlfcn.h>
#include <pybind11/eval.h>

#include <cstdlib>

#include "Frames.h"
#include "media/ImageFiles.h"
#include "tessarofx/ColorAdjust.h"
#include "tessarofx/NLEHost.h"

namespace tfxpy {
namespace {

py::object g_error, g_parameterError, g_lutError;

// The classes are plain Python so that they pickle, print and subclass as users expect.
const char* const kErrorClasses = R"(
class Error(Exception):
    """A failure reported by TessaroFx. `code` is the library's result code (an unsigned
    32-bit HRESULT such as 0x80000001), 0 when the module itself refused."""

    def __init__(self, message, code=0):
        super().__init__(message)
        self.message = message
        self.code = code

    def __reduce__(self):
        return (type(self), (self.message, self.code))


class ParameterError(Error, ValueError):
    """An unknown filter, function or parameter, or a value outside its range."""


class LutError(Error):
    """A LUT file that cannot be read or written."""
)";

}  // namespace

void Throw(const tfxtool::Status& status, ErrorKind kind) {
  throw ModuleError{kind, status.message(), static_cast<uint32_t>(status.code())};
}

void RegisterErrors(py::module_& module) {
  py::dict scope;
  scope["__name__"] = "tessarofx";
  py::exec(kErrorClasses, scope);
  g_error = scope["Error"];
  g_parameterError = scope["ParameterError"];
  g_lutError = scope["LutError"];
  module.attr("Error") = g_error;
  module.attr("ParameterError") = g_parameterError;
  module.attr("LutError") = g_lutError;
  py::register_exception_translator([](std::exception_ptr p) {
    try {
      if (p) std::rethrow_exception(p);
    } catch (const ModuleError& e) {
      const py::object& type = e.kind == ErrorKind::kParameter ? g_parameterError
                               : e.kind == ErrorKind::kLut     ? g_lutError
                                                               : g_error;
      py::object instance = type(e.message, e.code);
      PyErr_SetObject(type.ptr(), instance.ptr());
    }
  });
}

const tfxtool::PluginLibrary& Plugin() {
  // The library this module links, by its own file name, so that filters and the free
  // functions are always one build; the loader hands back the mapping it already has.
  static const auto* loaded = [] {
    auto* plugin = new tfxtool::PluginLibrary;
    Dl_info info = {};
    std::string path;
    if (dladdr(reinterpret_cast<void*>(&exposureAdjustment), &info) != 0 && info.dli_fname) {
      path = info.dli_fname;
    }
    auto* status = new tfxtool::Status(plugin->Load(path));
    // Runs the plug-in's one-time merge of its registries before anything else asks it.
    if (status->ok()) plugin->FilterCount();
    return new std::pair<tfxtool::PluginLibrary*, tfxtool::Status*>(plugin, status);
  }();
  Check(*loaded->second, ErrorKind::kError);
  return *loaded->first;
}

}  // namespace tfxpy

namespace {

using namespace tfxpy;

py::array ReadImageFile(const std::string& path, const std::string& order) {
  const Order o = ParseOrder(order);
  cv::Mat bgra;
  tfxtool::Status status;
  {
    py::gil_scoped_release released;
    status = tfxtool::ReadImage(path, &bgra);
  }
  Check(status, ErrorKind::kError);
  return FromBgra(bgra, o);
}

void WriteImageFile(const std::string& path, py::handle image, const std::string& order) {
  const Order o = ParseOrder(order);
  Check(tfxtool::CheckWritableFormat(path), ErrorKind::kParameter);
  FrameIn in = ReadFrame(image, o, "image");
  tfxtool::Status status;
  {
    py::gil_scoped_release released;
    status = tfxtool::WriteImage(path, ToBgra(in.pixels, o));
  }
  Check(status, ErrorKind::kError);
}

}  // namespace

PYBIND11_MODULE(_native, m) {
  m.doc() = "TessaroFx filters, image functions and LUTs on NumPy arrays (compiled part).";
  // Creation lines are informational: quiet, as in the tool, unless the environment asks.
  if (INLELogger* logger = NLEGetDefaultLogger(); logger && !std::getenv("TESSAROFX_LOG_LEVEL")) {
    logger->SetLevel(kNLELogWarning);
  }
  m.def(
      "set_log_level",
      [](int level) {
        if (level < 0) throw py::value_error("a log level is 0 or more");
        if (INLELogger* logger = NLEGetDefaultLogger()) logger->SetLevel(level);
      },
      py::arg("level"),
      "The plug-in's log threshold: 0 trace, 16 debug, 32 info, 48 warning, 64 error.");
  RegisterErrors(m);
  RegisterFilters(m);
  RegisterFunctions(m);
  RegisterLuts(m);
  m.def("read_image", &ReadImageFile, py::arg("path"), py::arg("order") = "bgra",
        "Reads an image file as the tool does: any format OpenCV decodes, as 8-bit pixels.");
  m.def("write_image", &WriteImageFile, py::arg("path"), py::arg("image"),
        py::arg("order") = "bgra",
        "Writes an image file as the tool does: PNG, TIFF and WebP keep alpha, JPEG and BMP drop "
        "it; the file is replaced in one step.");
  m.def(
      "to_bgra",
      [](py::handle frame, const std::string& order) {
        const Order o = ParseOrder(order);
        FrameIn in = ReadFrame(frame, o, "frame");
        cv::Mat bgra;
        {
          py::gil_scoped_release released;
          bgra = BgraCopy(in.pixels, o);
        }
        return FromBgra(bgra, Order::kBgra);
      },
      py::arg("frame"), py::arg("order") = "bgra", "A packed BGRA copy of a frame in `order`.");
  m.def(
      "from_bgra",
      [](py::handle frame, const std::string& order) {
        const Order o = ParseOrder(order);
        FrameIn in = ReadFrame(frame, Order::kBgra, "frame");
        return FromBgra(o == Order::kBgra ? in.pixels.clone() : in.pixels, o);
      },
      py::arg("frame"), py::arg("order") = "bgra", "A BGRA frame as a new array in `order`.");
}
