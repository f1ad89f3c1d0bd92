#include "plugin/PluginCubeLut.h"

#include <new>
#include <type_traits>

namespace tfxtool {
namespace {

// Itanium ABI: a member takes `this` as a hidden first argument, so each one is called through
// a free-function pointer with the object first. The member pointer types below are taken in
// unevaluated context only, which ties the pointer types to the public declarations without
// referring to anything the tool would have to link.
using CtorFn = void (*)(CubeLut*);
using DtorFn = void (*)(CubeLut*);
using LoadFn = int (*)(CubeLut*, std::ifstream&, CubeLut::Stop*);
using LoadLatticeFn = int (*)(std::ifstream&, std::vector<float>*, int*, CubeLut::Stop*);
using StopMessageFn = std::string (*)(const std::string&, const CubeLut::Stop&);
using InterpolateFn = void (*)(const float*, int, float, float, float, float*);
using LatticeFn = float* (*)(CubeLut*, int*, int*, int*, int*);
using DomainFn = void (*)(const CubeLut*, float*, float*);
using TitleFn = const char* (*)(const CubeLut*);
using GenerateFn = void (*)(CubeLut*, int);
using WriteFn = bool (*)(CubeLut*, const char*);
static_assert(std::is_same_v<decltype(&CubeLut::loadCubeFileWithStop),
                             int (CubeLut::*)(std::ifstream&, CubeLut::Stop*)>);
static_assert(std::is_same_v<decltype(&CubeLut::load3DlFileWithStop),
                             int (CubeLut::*)(std::ifstream&, CubeLut::Stop*)>);
// Static members are plain functions.
static_assert(std::is_same_v<decltype(&CubeLut::loadCubeLattice), LoadLatticeFn>);
static_assert(std::is_same_v<decltype(&CubeLut::stopMessage), StopMessageFn>);
static_assert(std::is_same_v<decltype(&CubeLut::interpolate), InterpolateFn>);
static_assert(
    std::is_same_v<decltype(&CubeLut::getLut3DData), float* (CubeLut::*)(int*, int*, int*, int*)>);
static_assert(
    std::is_same_v<decltype(&CubeLut::getDomain), void (CubeLut::*)(float*, float*) const>);
static_assert(std::is_same_v<decltype(&CubeLut::getTitle), const char* (CubeLut::*)() const>);
static_assert(std::is_same_v<decltype(&CubeLut::generateLUT3DData), void (CubeLut::*)(int)>);
static_assert(std::is_same_v<decltype(&CubeLut::writeLUT3D2File), bool (CubeLut::*)(const char*)>);
// Heap storage from new[] is aligned for any type up to this.
static_assert(alignof(CubeLut) <= __STDCPP_DEFAULT_NEW_ALIGNMENT__);

}  // namespace

struct PluginCubeLut::Members {
  CtorFn construct = nullptr;  // complete-object constructor (C1)
  DtorFn destroy = nullptr;    // complete-object destructor (D1): the storage is ours
  LoadFn loadCube = nullptr;
  LoadFn load3Dl = nullptr;
  LoadLatticeFn loadLattice = nullptr;
  StopMessageFn stopMessage = nullptr;
  InterpolateFn interpolate = nullptr;
  LatticeFn lattice = nullptr;
  DomainFn domain = nullptr;
  TitleFn title = nullptr;
  GenerateFn generate = nullptr;
  WriteFn write = nullptr;
};

Status PluginCubeLut::Create(const PluginLibrary& plugin, std::unique_ptr<PluginCubeLut>* out) {
  auto m = std::make_unique<Members>();
  // Every symbol is looked up; the first one missing is reported.
  const Status found[] = {
      plugin.Resolve("_ZN7CubeLutC1Ev", &m->construct),
      plugin.Resolve("_ZN7CubeLutD1Ev", &m->destroy),
      plugin.Resolve(
          "_ZN7CubeLut20loadCubeFileWithStopERSt14basic_ifstreamIcSt11char_traitsIcEEPNS_4StopE",
          &m->loadCube),
      plugin.Resolve(
          "_ZN7CubeLut19load3DlFileWithStopERSt14basic_ifstreamIcSt11char_traitsIcEEPNS_4StopE",
          &m->load3Dl),
      plugin.Resolve("_ZN7CubeLut15loadCubeLatticeERSt14basic_ifstreamIcSt11char_traitsIcEEPSt6"
                     "vectorIfSaIfEEPiPNS_4StopE",
                     &m->loadLattice),
      plugin.Resolve("_ZN7CubeLut11stopMessageERKNSt7__cxx1112basic_stringIcSt11char_traitsIcESaIc"
                     "EEERKNS_4StopE",
                     &m->stopMessage),
      plugin.Resolve("_ZN7CubeLut11interpolateEPKfifffPf", &m->interpolate),
      plugin.Resolve("_ZN7CubeLut12getLut3DDataEPiS0_S0_S0_", &m->lattice),
      plugin.Resolve("_ZNK7CubeLut9getDomainEPfS0_", &m->domain),
      plugin.Resolve("_ZNK7CubeLut8getTitleEv", &m->title),
      plugin.Resolve("_ZN7CubeLut17generateLUT3DDataEi", &m->generate),
      plugin.Resolve("_ZN7CubeLut15writeLUT3D2FileEPKc", &m->write),
  };
  for (const Status& s : found) {
    if (!s.ok()) return s;
  }
  out->reset(new PluginCubeLut(plugin, std::move(m)));
  return Status::Ok();
}

PluginCubeLut::PluginCubeLut(const PluginLibrary& plugin, std::unique_ptr<Members> members)
    : plugin_(plugin), members_(std::move(members)), storage_(new std::byte[sizeof(CubeLut)]) {
  // What `new CubeLut()` would do, minus the allocation: construct in place, then use the object
  // through the pointer the storage now holds.
  members_->construct(reinterpret_cast<CubeLut*>(storage_.get()));
  object_ = std::launder(reinterpret_cast<CubeLut*>(storage_.get()));
}

PluginCubeLut::~PluginCubeLut() { members_->destroy(object_); }

int PluginCubeLut::LoadCube(std::ifstream& in, CubeLut::Stop* stop) const {
  return members_->loadCube(object_, in, stop);
}

int PluginCubeLut::Load3Dl(std::ifstream& in, CubeLut::Stop* stop) const {
  return members_->load3Dl(object_, in, stop);
}

int PluginCubeLut::LoadCubeLattice(std::ifstream& in, std::vector<float>* points, int* size,
                                   CubeLut::Stop* stop) const {
  return members_->loadLattice(in, points, size, stop);
}

std::string PluginCubeLut::StopMessage(const std::string& file, const CubeLut::Stop& stop) const {
  return members_->stopMessage(file, stop);
}

void PluginCubeLut::Interpolate(const float* points, int size, float red, float green, float blue,
                                float out[3]) const {
  members_->interpolate(points, size, red, green, blue, out);
}

float* PluginCubeLut::Lattice(int* size) const {
  return members_->lattice(object_, size, nullptr, nullptr, nullptr);
}

void PluginCubeLut::Domain(float minimum[3], float maximum[3]) const {
  members_->domain(object_, minimum, maximum);
}

std::string PluginCubeLut::Title() const { return members_->title(object_); }

void PluginCubeLut::Generate(int n) const { members_->generate(object_, n); }

bool PluginCubeLut::Write(const std::string& path) const {
  return members_->write(object_, path.c_str());
}

}  // namespace tfxtool
