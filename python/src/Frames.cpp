#include "Frames.h"

#include <climits>
#include <opencv2/imgproc.hpp>

namespace tfxpy {
namespace {

const char* OrderName(Order order) {
  switch (order) {
    case Order::kBgra:
      return "bgra";
    case Order::kRgba:
      return "rgba";
    case Order::kBgr:
      return "bgr";
    case Order::kRgb:
      return "rgb";
  }
  return "";
}

std::string ShapeText(const py::array& a) {
  std::string text = "(";
  for (py::ssize_t i = 0; i < a.ndim(); ++i) {
    text += (i ? ", " : "") + std::to_string(a.shape(i));
  }
  return text + (a.ndim() == 1 ? ",)" : ")");
}

}  // namespace

Order ParseOrder(const std::string& text) {
  for (Order order : {Order::kBgra, Order::kRgba, Order::kBgr, Order::kRgb}) {
    if (text == OrderName(order)) return order;
  }
  throw py::value_error("order must be 'bgra', 'rgba', 'bgr' or 'rgb', not '" + text + "'");
}

int Channels(Order order) { return order == Order::kBgra || order == Order::kRgba ? 4 : 3; }

FrameIn ReadFrame(py::handle object, Order order, const char* what) {
  const int channels = Channels(order);
  const std::string expected = std::string("an H x W x ") + std::to_string(channels) +
                               " uint8 array (" + OrderName(order) + ")";
  if (!py::isinstance<py::array>(object)) {
    throw py::type_error(std::string(what) + " must be " + expected + ", not " +
                         std::string(py::str(py::type::handle_of(object).attr("__name__"))));
  }
  auto array = py::reinterpret_borrow<py::array>(object);
  if (!array.dtype().is(py::dtype::of<uint8_t>())) {
    throw py::type_error(std::string(what) + " must be " + expected + ", not dtype " +
                         std::string(py::str(array.dtype())));
  }
  if (array.ndim() != 3 || array.shape(2) != channels || array.shape(0) < 1 || array.shape(1) < 1) {
    throw py::value_error(std::string(what) + " must be " + expected + ", not shape " +
                          ShapeText(array));
  }
  const py::ssize_t rows = array.shape(0), cols = array.shape(1);
  // Frames count rows, columns and row bytes in 32-bit integers.
  if (rows > INT_MAX || cols > INT_MAX / 4) {
    throw py::value_error(std::string(what) + " of shape " + ShapeText(array) +
                          " is larger than a frame can be");
  }
  // Packed pixels with rows some positive distance apart are read in place; any other layout
  // (columns of a wider array, flipped or transposed views) is copied once into packed rows.
  const bool packedPixels = array.strides(2) == 1 && array.strides(1) == channels &&
                            array.strides(0) >= cols * channels && array.strides(0) <= INT_MAX;
  if (!packedPixels) {
    array = py::array_t<uint8_t, py::array::c_style>::ensure(array);
    if (!array) throw py::error_already_set();
  }
  FrameIn in;
  in.pixels = cv::Mat(static_cast<int>(rows), static_cast<int>(cols), CV_8UC(channels),
                      const_cast<void*>(array.data()), static_cast<size_t>(array.strides(0)));
  in.keep = std::move(array);
  return in;
}

cv::Mat ToBgra(const cv::Mat& pixels, Order order) {
  cv::Mat bgra;
  switch (order) {
    case Order::kBgra:
      return pixels;
    case Order::kRgba:
      cv::cvtColor(pixels, bgra, cv::COLOR_RGBA2BGRA);
      break;
    case Order::kBgr:
      cv::cvtColor(pixels, bgra, cv::COLOR_BGR2BGRA);
      break;
    case Order::kRgb:
      cv::cvtColor(pixels, bgra, cv::COLOR_RGB2BGRA);
      break;
  }
  return bgra;
}

cv::Mat BgraCopy(const cv::Mat& pixels, Order order) {
  return order == Order::kBgra ? pixels.clone() : ToBgra(pixels, order);
}

py::array_t<uint8_t> NewFrame(int rows, int cols, Order order, cv::Mat* pixels) {
  const int channels = Channels(order);
  py::array_t<uint8_t> array({rows, cols, channels});
  *pixels = cv::Mat(rows, cols, CV_8UC(channels), array.mutable_data());
  return array;
}

void BgraInto(const cv::Mat& bgra, Order order, cv::Mat* out) {
  switch (order) {
    case Order::kBgra:
      bgra.copyTo(*out);
      break;
    case Order::kRgba:
      cv::cvtColor(bgra, *out, cv::COLOR_BGRA2RGBA);
      break;
    case Order::kBgr:
      cv::cvtColor(bgra, *out, cv::COLOR_BGRA2BGR);
      break;
    case Order::kRgb:
      cv::cvtColor(bgra, *out, cv::COLOR_BGRA2RGB);
      break;
  }
}

py::array FromBgra(const cv::Mat& bgra, Order order) {
  if (order == Order::kBgra && bgra.type() == CV_8UC4) {
    // The array keeps the matrix's reference-counted buffer alive instead of copying it.
    auto* owner = new cv::Mat(bgra);
    py::capsule free(owner, [](void* p) { delete static_cast<cv::Mat*>(p); });
    return py::array_t<uint8_t>(
        {bgra.rows, bgra.cols, 4},
        {static_cast<py::ssize_t>(bgra.step[0]), py::ssize_t{4}, py::ssize_t{1}}, bgra.data, free);
  }
  cv::Mat out;
  py::array_t<uint8_t> array = NewFrame(bgra.rows, bgra.cols, order, &out);
  {
    py::gil_scoped_release released;
    BgraInto(bgra, order, &out);
  }
  return std::move(array);
}

}  // namespace tfxpy
