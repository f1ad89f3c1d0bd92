// 3D LUTs through the plug-in's own CubeLut: its readers and writer, the tool's size limits and
// resampling, the bake of filter settings into a table, and doLUT on arrays.
#include <pybind11/stl.h>

#include <cstring>
#include <memory>
#include <mutex>
#include <optional>
#include <vector>

#include "Frames.h"
#include "Module.h"
#include "media/LutFiles.h"
#include "plugin/PluginCubeLut.h"

namespace tfxpy {
namespace {

using tfxtool::LutTable;
using tfxtool::PluginCubeLut;
using tfxtool::Status;

void CheckSize(int size) {
  if (size < 2 || size > tfxtool::kPluginMaxSize) {
    throw ModuleError{ErrorKind::kParameter,
                      "a LUT size is 2 to " + std::to_string(tfxtool::kPluginMaxSize) +
                          " points per axis, not " + std::to_string(size),
                      0};
  }
}

class NativeLut {
 public:
  NativeLut() { Check(PluginCubeLut::Create(Plugin(), &lut_), ErrorKind::kError); }

  // The plug-in's reader when it takes the file as it is; the tool's reading of tables of any
  // size the format allows, resampled, when a size is asked for or the file is larger.
  static std::unique_ptr<NativeLut> Read(const std::string& path, std::optional<int> size) {
    if (size) CheckSize(*size);
    auto made = std::make_unique<NativeLut>();
    const PluginCubeLut& lut = *made->lut_;
    Status loaded;
    {
      py::gil_scoped_release released;
      loaded = tfxtool::LoadThroughPlugin(path, lut);
    }
    int loadedSize = 0;
    if (loaded.ok()) lut.Lattice(&loadedSize);
    if (loaded.ok() && (!size || *size == loadedSize)) return made;
    if (!size) Check(loaded, ErrorKind::kLut);

    Status status;
    {
      py::gil_scoped_release released;
      LutTable table;
      status = tfxtool::ReadLutTable(lut, path, &table);
      if (status.ok() && table.size != *size) table = tfxtool::ResampleTable(lut, table, *size);
      if (status.ok()) status = tfxtool::FillLattice(lut, table);
    }
    Check(status, ErrorKind::kLut);
    return made;
  }

  // `steps` as (filter, ["NAME=VALUE", ...]), applied in order to the identity of `size` points.
  static std::unique_ptr<NativeLut> Bake(
      const std::vector<std::pair<std::string, std::vector<std::string>>>& steps, int size) {
    CheckSize(size);
    std::vector<tfxtool::BakeStep> baked;
    for (const auto& [filter, settings] : steps) {
      baked.emplace_back();
      Check(tfxtool::StartStep(filter, &baked.back()), ErrorKind::kParameter);
      for (const std::string& setting : settings) {
        Check(tfxtool::SetStepParam(setting, &baked.back()), ErrorKind::kParameter);
      }
    }
    auto made = std::make_unique<NativeLut>();
    Status status;
    {
      py::gil_scoped_release released;
      status = tfxtool::FillLattice(*made->lut_, tfxtool::IdentityTable(size));
      for (const tfxtool::BakeStep& step : baked) {
        if (status.ok()) status = tfxtool::ApplyStep(*made->lut_, step);
      }
    }
    Check(status, ErrorKind::kError);
    return made;
  }

  void Write(const std::string& path) {
    if (tfxtool::LutFormatOf(path) != tfxtool::LutFormat::kCube) {
      throw ModuleError{ErrorKind::kLut,
                        "cannot write " + path + ": LUTs are written as .cube files", 0};
    }
    Status status;
    {
      py::gil_scoped_release released;
      std::lock_guard<std::mutex> lock(mutex_);
      status = tfxtool::WriteThroughPlugin(*lut_, path);
    }
    Check(status, ErrorKind::kLut);
  }

  py::array Apply(py::handle frame, const std::string& order) {
    const Order o = ParseOrder(order);
    FrameIn in = ReadFrame(frame, o, "frame");
    cv::Mat bgra;
    int status = 0;
    {
      py::gil_scoped_release released;
      bgra = BgraCopy(in.pixels, o);
      std::lock_guard<std::mutex> lock(mutex_);
      status =
          lut_->get()->doLUT(bgra.data, bgra.cols, bgra.rows, static_cast<int>(bgra.step[0]), 4);
    }
    if (status != 0) {
      throw ModuleError{ErrorKind::kLut,
                        std::string("the table was refused: ") + CubeLut::statusText(status), 0};
    }
    return FromBgra(bgra, o);
  }

  int size() const {
    int n = 0;
    lut_->Lattice(&n);
    return n;
  }
  std::string title() const { return lut_->Title(); }
  py::tuple domain() const {
    float lo[3], hi[3];
    lut_->Domain(lo, hi);
    return py::make_tuple(py::make_tuple(lo[0], lo[1], lo[2]), py::make_tuple(hi[0], hi[1], hi[2]));
  }
  // A copy of the lattice: [red][green][blue][channel], in the plug-in's 0..255 units.
  py::array_t<float> table() const {
    int n = 0;
    const float* lattice = lut_->Lattice(&n);
    py::array_t<float> out({n, n, n, 3});
    float* p = out.mutable_data();
    const int cap = tfxtool::kPluginMaxSize;
    for (int i = 0; i < n; ++i) {
      for (int j = 0; j < n; ++j, p += 3 * n) {
        std::memcpy(p, lattice + (i * cap + j) * cap * 3, sizeof(float) * 3 * n);
      }
    }
    return out;
  }

 private:
  std::unique_ptr<PluginCubeLut> lut_;
  std::mutex mutex_;
};

}  // namespace

void RegisterLuts(py::module_& m) {
  py::class_<NativeLut>(m, "NativeLut")
      .def_static("read", &NativeLut::Read, py::arg("path"), py::arg("size") = py::none())
      .def_static("bake", &NativeLut::Bake, py::arg("steps"), py::arg("size"))
      .def("write", &NativeLut::Write, py::arg("path"))
      .def("apply", &NativeLut::Apply, py::arg("frame"), py::arg("order") = "bgra")
      .def_property_readonly("size", &NativeLut::size)
      .def_property_readonly("title", &NativeLut::title)
      .def_property_readonly("domain", &NativeLut::domain)
      .def_property_readonly("table", &NativeLut::table);
}

}  // namespace tfxpy
