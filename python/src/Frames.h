// NumPy arrays as the 8-bit BGRA frames the plug-in and the image functions take, and back.
#pragma once

#include <pybind11/numpy.h>
#include <pybind11/pybind11.h>

#include <opencv2/core.hpp>
#include <string>

namespace tfxpy {

namespace py = pybind11;

// The channel order of the caller's arrays; the library's own is BGRA.
enum class Order { kBgra, kRgba, kBgr, kRgb };

Order ParseOrder(const std::string& text);
int Channels(Order order);

// An array read as a frame: `pixels` is in the caller's order and shares the array's memory
// (or a packed copy of it when its pixels are not packed), `keep` holds that memory.
struct FrameIn {
  py::object keep;
  cv::Mat pixels;
};

// Checks type, dtype and shape, naming `what` ("frame", "background") and what was expected.
// Needs the GIL.
FrameIn ReadFrame(py::handle array, Order order, const char* what);

// `pixels` in BGRA: the same matrix when it already is, else a converted copy. No GIL needed.
cv::Mat ToBgra(const cv::Mat& pixels, Order order);
// A fresh BGRA copy, for functions that work in place. No GIL needed.
cv::Mat BgraCopy(const cv::Mat& pixels, Order order);

// An H x W x channels array of the order, newly allocated, and a matrix over its memory.
// Needs the GIL.
py::array_t<uint8_t> NewFrame(int rows, int cols, Order order, cv::Mat* pixels);

// A BGRA result as an array of the order: BGRA matrices are handed over without a copy.
// Needs the GIL.
py::array FromBgra(const cv::Mat& bgra, Order order);

// Converts a BGRA matrix into `out`, an array's pixels in the order. No GIL needed.
void BgraInto(const cv::Mat& bgra, Order order, cv::Mat* out);

}  // namespace tfxpy
