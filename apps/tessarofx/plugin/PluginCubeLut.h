// A CubeLut object of the loaded plug-in, driven through the members it exports, and the
// class's static functions beside it. The tool is a dlopen host and never links the plug-in, so
// it cannot call CubeLut's members or even name its type information (which a sanitizer's checks
// of member calls would need); instead it resolves each member by its symbol and calls it with
// the object as the first argument, as the compiler would; static members take no object.
#pragma once

#include <cstddef>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "Status.h"
#include "plugin/PluginLibrary.h"
#include "tessarofx/CubeLut.h"

namespace tfxtool {

class PluginCubeLut {
 public:
  // Constructs an object in storage of its own (a CubeLut is about 3 MiB, so on the heap).
  static Status Create(const PluginLibrary& plugin, std::unique_ptr<PluginCubeLut>* out);
  ~PluginCubeLut();
  PluginCubeLut(const PluginCubeLut&) = delete;
  PluginCubeLut& operator=(const PluginCubeLut&) = delete;

  CubeLut* get() const { return object_; }

  // The plug-in's readers on a stream the caller opened (binary); they return the status code
  // and say in `stop` where they stopped.
  int LoadCube(std::ifstream& in, CubeLut::Stop* stop) const;
  int Load3Dl(std::ifstream& in, CubeLut::Stop* stop) const;
  // The plug-in's ".CUBE" reader for tables of any size the format allows, into caller memory.
  int LoadCubeLattice(std::ifstream& in, std::vector<float>* points, int* size,
                      CubeLut::Stop* stop) const;
  // The plug-in's complaint about a file a reader stopped on.
  std::string StopMessage(const std::string& file, const CubeLut::Stop& stop) const;
  // The plug-in's tetrahedral interpolation of a lattice of any size at a position.
  void Interpolate(const float* points, int size, float red, float green, float blue,
                   float out[3]) const;

  // The 64-strided float lattice, lattice[((i * 64 + j) * 64 + k) * 3 + c] for red index i,
  // green j, blue k; *size receives N.
  float* Lattice(int* size) const;
  void Domain(float minimum[3], float maximum[3]) const;
  std::string Title() const;
  // Size n with the plug-in's identity-like lattice (exact only for n = 32).
  void Generate(int n) const;
  // The plug-in's ".CUBE" writer.
  bool Write(const std::string& path) const;

  // The free functions the plug-in exports beside the class, as typed pointers.
  template <class Fn>
  Status Resolve(const char* name, Fn* fn) const {
    return plugin_.Resolve(name, fn);
  }

 private:
  struct Members;
  PluginCubeLut(const PluginLibrary& plugin, std::unique_ptr<Members> members);

  const PluginLibrary& plugin_;
  std::unique_ptr<Members> members_;
  std::unique_ptr<std::byte[]> storage_;
  CubeLut* object_ = nullptr;
};

}  // namespace tfxtool
