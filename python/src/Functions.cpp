// The exported image functions, through the same table and calls as the tool's fx command, so
// that an array gets the bytes a file gets there. The two measuring functions return numbers
// where the tool prints them.
#include <pybind11/stl.h>

#include <optional>

#include "Frames.h"
#include "Module.h"
#include "commands/ImageFunctions.h"
#include "tessarofx/WhiteBalanceEstimate.h"

namespace tfxpy {
namespace {

using tfxtool::ImageFunction;
using tfxtool::Status;

py::list ListFunctions() {
  py::list list;
  for (const ImageFunction& fn : tfxtool::ImageFunctions()) {
    py::list args, also;
    for (const tfxtool::FxArg& a : fn.args) args.append(py::make_tuple(a.name, a.min, a.max));
    for (const char* other : fn.also) also.append(other);
    py::dict d;
    d["name"] = fn.name;
    d["function"] = fn.function;
    d["args"] = args;
    d["meaning"] = fn.meaning;
    d["inputs"] = fn.inputs;
    d["writes"] = fn.writes;
    d["also"] = also;
    d["second"] = fn.secondName ? py::object(py::str(fn.secondName)) : py::object(py::none());
    list.append(d);
  }
  return list;
}

const ImageFunction& Find(const std::string& name) {
  const ImageFunction* fn = tfxtool::FindImageFunction(name);
  if (!fn) throw ModuleError{ErrorKind::kParameter, "unknown function '" + name + "'", 0};
  return *fn;
}

py::array Call(const std::string& name, py::handle image, const std::vector<std::string>& args,
               py::handle second, const std::string& order) {
  const ImageFunction& fn = Find(name);
  const Order o = ParseOrder(order);
  tfxtool::ImageCall call;
  Check(tfxtool::PrepareImageCall(fn, args, &call), ErrorKind::kParameter);
  FrameIn in = ReadFrame(image, o, "image");
  std::optional<FrameIn> other;
  if (fn.inputs > 1) {
    if (second.is_none()) {
      throw py::type_error(std::string(fn.name) + " needs a second image (" +
                           (fn.secondName ? fn.secondName : "SECOND") + ")");
    }
    other = ReadFrame(second, o, fn.secondName ? fn.secondName : "second");
  }
  cv::Mat bgra, bgraSecond;
  Status status;
  {
    py::gil_scoped_release released;
    // The functions work in place; the caller's array is only read.
    bgra = BgraCopy(in.pixels, o);
    if (other) bgraSecond = ToBgra(other->pixels, o);
    status = tfxtool::CallImageFunction(call, &bgra, other ? &bgraSecond : nullptr);
  }
  Check(status, ErrorKind::kError);
  return FromBgra(bgra, o);
}

struct Packed {
  FrameIn in;
  cv::Mat bgra;
};

Packed ReadPacked(py::handle image, Order order, const char* what) {
  Packed p{ReadFrame(image, order, what), {}};
  p.bgra = ToBgra(p.in.pixels, order);
  if (!p.bgra.isContinuous()) p.bgra = p.bgra.clone();
  return p;
}

// The steps of `fx white-point`, as numbers.
py::dict WhitePoint(py::handle image, const std::string& order) {
  const Packed px = ReadPacked(image, ParseOrder(order), "image");
  const unsigned char* data = px.bgra.data;
  const int w = px.bgra.cols, h = px.bgra.rows;
  unsigned char r = 0, g = 0, b = 0;
  float X = 0, Y = 0, Z = 0, x = 0, y = 0, Yxy = 0;
  int64_t mireds = 0, kelvin = 0;
  {
    py::gil_scoped_release released;
    r = channelMean(data, w, h, 2);
    g = channelMean(data, w, h, 1);
    b = channelMean(data, w, h, 0);
    rgb2xyz(r, g, b, X, Y, Z);
    xyz2xy(X, Y, Z, x, y, Yxy);
    mireds = xy_to_CCT_Hernandez1999(x, y);
    kelvin = rgb2temperature(r, g, b);
  }
  py::dict d;
  d["mean"] = py::make_tuple(r, g, b);
  d["xyz"] = py::make_tuple(X, Y, Z);
  d["xy"] = py::make_tuple(x, y);
  d["mireds"] = mireds;
  d["kelvin"] = kelvin;
  return d;
}

// The steps of `fx wb-rates`: how far `corrected` moved from `source`, in slider units.
py::tuple WhiteBalanceRates(py::handle source, py::handle corrected, const std::string& order) {
  const Order o = ParseOrder(order);
  const Packed src = ReadPacked(source, o, "source");
  const Packed dst = ReadPacked(corrected, o, "corrected");
  if (src.bgra.size() != dst.bgra.size()) {
    throw py::value_error("the corrected image must have the source's size");
  }
  double temperature = 0, tint = 0;
  {
    py::gil_scoped_release released;
    temperature = getAutoWhiteBalanceCCTChangeRate(src.bgra.data, dst.bgra.data, src.bgra.cols,
                                                   src.bgra.rows);
    tint = getAutoWhiteBalanceTintChangeRate(src.bgra.data, dst.bgra.data, src.bgra.cols,
                                             src.bgra.rows);
  }
  return py::make_tuple(temperature, tint);
}

}  // namespace

void RegisterFunctions(py::module_& m) {
  m.def("functions", &ListFunctions, "The image functions as the tool's fx command lists them.");
  m.def("call_function", &Call, py::arg("name"), py::arg("image"), py::arg("args"),
        py::arg("second"), py::arg("order"));
  m.def("white_point", &WhitePoint, py::arg("image"), py::arg("order") = "bgra");
  m.def("wb_rates", &WhiteBalanceRates, py::arg("source"), py::arg("corrected"),
        py::arg("order") = "bgra");
}

}  // namespace tfxpy
