#include "PluginCubeLut.h"

#include <new>
#include <type_traits>

#include "tessarofx/CubeLut.h"

namespace tfxtool {
namespace {

// Itanium ABI: a member takes `this` as a hidden first argument, so each one is called through
// a free-function pointer with the object first. The member pointer types below are taken in
// unevaluated context only, which ties the pointer types to the public declarations without
// referring to anything the tool would have to link.
using CtorFn = void (*)(CubeLut*);
using DtorFn = void (*)(CubeLut*);
using LoadFn = int (*)(CubeLut*, std::ifstream&);
using LatticeFn = float* (*)(CubeLut*, int*, int*, int*, int*);
using DomainFn = void (*)(const CubeLut*, float*, float*);
using TitleFn = const char* (*)(const CubeLut*);
using GenerateFn = void (*)(CubeLut*, int);
using WriteFn = bool (*)(CubeLut*, const char*);
static_assert(std::is_same_v<decltype(&CubeLut::loadCubeFile), int (CubeLut::*)(std::ifstream&)>);
static_assert(std::is_same_v<decltype(&CubeLut::load3DlFile), int (CubeLut::*)(std::ifstream&)>);
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
      plugin.Resolve("_ZN7CubeLut12loadCubeFileERSt14basic_ifstreamIcSt11char_traitsIcEE",
                     &m->loadCube),
      plugin.Resolve("_ZN7CubeLut11load3DlFileERSt14basic_ifstreamIcSt11char_traitsIcEE",
                     &m->load3Dl),
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

int PluginCubeLut::LoadCube(std::ifstream& in) const { return members_->loadCube(object_, in); }

int PluginCubeLut::Load3Dl(std::ifstream& in) const { return members_->load3Dl(object_, in); }

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
