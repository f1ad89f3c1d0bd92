// One 3D colour look-up table: an N x N x N lattice of RGB outputs over the 8-bit input cube,
// read from ".CUBE" or ".3DL" text files, written as ".CUBE", and applied to 8-bit BGR(A) pixels
// with tetrahedral interpolation.
//
// The lattice has a fixed capacity of 64 points per axis whatever N is, so an object is about
// 3 MiB and belongs on the heap. lattice[i][j][k] is the output (red, green, blue) for red index
// i, green index j and blue index k, in 0..255 units (floats, not clamped). Files with more than
// 64 points per axis are refused with status 23.
//
// File operations report small positive status codes, kept in the object and returned by the
// readers:
//    0 success                                 20 .CUBE: unknown or repeated keyword
//    1 nothing loaded yet                      21 .CUBE: TITLE not followed by '"'
//   10 a stream read failed                    22 .CUBE: a domain maximum not above its minimum
//   12 end of file while looking for a line    23 size missing or outside 2..64 (doLUT: 1..64)
//   13 no line end in the first 252 bytes      24 a row with fewer than three numbers, or a
//                                                 value that is infinite, NaN or past float
// A failed read leaves the lattice zeroed up to the rows read before the error. statusText()
// gives these meanings in words, and the readers that take a Stop say on which physical line
// they stopped, for messages that point into the file.
//
// Threading: an object is used by one thread at a time. getInstance() hands out a process-wide
// object that every public construction (clone() included) replaces; objects may be built on
// several threads at once, but code that may run on several threads owns its objects and never
// uses the instance, which another thread can replace or release at any moment.
//
// What a host may rely on: the instance is only ever an object built through the public
// constructor or clone(), by the host or by getInstance(). The filters build their lattices
// unlisted, so getInstance() never returns a filter's table and releaseInstance() can never
// destroy one; a host may call both at any time without harming a filter.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <fstream>
#include <string>
#include <vector>

#include "tessarofx/Export.h"

class TFX_API CubeLut {
 public:
  // One lattice point.
  struct PR {
    float red;
    float green;
    float blue;
  };

  static constexpr int kMaxSize = 64;  // points per axis the lattice holds
  // Points per axis the ".CUBE" format allows, and loadCubeLattice reads.
  static constexpr int kMaxFileSize = 256;
  // Bytes of a line a Stop keeps: one more than a message quotes, to tell that it was cut.
  static constexpr size_t kStopTextBytes = 61;

  // Where and why a reader stopped. `line` counts physical lines from 1, comments and blank
  // lines included, and is the line holding the last byte the reader took: the offending line
  // for an error, the last table row after a success. Two exceptions: a ".CUBE" header that
  // fails its checks as a whole (status 22, or 23 for a missing size) is blamed on the first
  // table row, where the reader found that the header had ended; and status 13 is line 1. An
  // empty file is line 0.
  struct Stop {
    int status = 1;
    long line = 0;
    // The start of that line (at most kStopTextBytes bytes) without its line end.
    std::string text;
    // The largest size the reader took, which status 23 refers to.
    int sizeLimit = kMaxSize;
  };

  // Status 1, size 0: doLUT refuses to run (23) until something is loaded or generated. The new
  // object becomes the process-wide instance.
  CubeLut();
  virtual ~CubeLut();
  CubeLut(const CubeLut&) = delete;
  CubeLut& operator=(const CubeLut&) = delete;

  // The process-wide object: the last one constructed, or a new one if none is registered.
  static CubeLut* getInstance();
  // Destroys the registered object, if any, and forgets it.
  static void releaseInstance();

  int getLutSize() const { return size_; }
  int getStatus() const { return status_; }
  // Out of line, so that a host that loads the plug-in at run time can reach it by name.
  const char* getTitle() const;
  // The domain of the last ".CUBE" read: (0,0,0)..(1,1,1) unless the file said otherwise.
  void getDomain(float minimum[3], float maximum[3]) const;

  // Reads a ".CUBE" or ".3DL" file (extension in any letter case). True only when the file
  // opened and its reader returned 0.
  bool loadFile(const wchar_t* path);
  // The two readers on an open binary stream; they return the status code. A host can use the
  // stream's position afterwards to tell where reading stopped.
  int load3DlFile(std::ifstream& in);
  int loadCubeFile(std::ifstream& in);
  // The same readers, also saying where they stopped; `stop` may be null. Named apart rather
  // than overloaded, so that code taking the address of the readers above still compiles.
  int load3DlFileWithStop(std::ifstream& in, Stop* stop);
  int loadCubeFileWithStop(std::ifstream& in, Stop* stop);
  // Reads a ".CUBE" file as loadCubeFile does (the same keywords, line skipping, sticky missing
  // components, status codes and Stop lines, the domain's width as the scale) but up to
  // kMaxFileSize points per axis, into `points` rather than an object: point (i, j, k) = (red,
  // green, blue index) at ((i * n + j) * n + k) * 3, and *size receives n (on failure 0, and
  // `points` is left empty). For tables too big for the lattice, which a caller resamples.
  // Returns the status code.
  static int loadCubeLattice(std::ifstream& in, std::vector<float>* points, int* size, Stop* stop);

  // What a status code means, in words: "" for 0, "unknown status" for a code no reader gives.
  static const char* statusText(int status);
  // The one form of every complaint about a LUT file a reader stopped on:
  //   FILE, line N ("TEXT"): status S, MEANING
  // without the line part for line 0. The text is cut to 60 bytes ("..." marks the cut) and its
  // quotes, backslashes and control bytes are escaped.
  static std::string stopMessage(const std::string& file, const Stop& stop);

  // doLUT's tetrahedral interpolation on a lattice of any size n >= 1, laid out as
  // loadCubeLattice's, at a position in lattice units (0..n - 1 per axis; outside, or NaN, is
  // clamped). The corner choice, weights and float arithmetic are doLUT's, without its rounding
  // to bytes, so resampling a table with it matches what applying the table does.
  static void interpolate(const float* points, int size, float red, float green, float blue,
                          float out[3]);
  // The next line that is not empty, not a '#' comment and not a bare "\r".
  std::string readLine(std::ifstream& in, char terminator);
  // Cuts at every single space; empty pieces count.
  void splitString(const std::string& line, std::vector<std::string>& out);
  // Three floats from the line; status 24 if fewer than three convert.
  std::vector<float> parseTableRow(const std::string& line);
  // Writes the lattice as a ".CUBE" file over the domain 0..1, red fastest.
  bool writeLUT3D2File(const char* path);

  // Applies the table in place to `height` rows of `width` pixels, bytes 0, 1, 2 = blue, green,
  // red; further bytes (alpha) are left as they are. Rows start `pitch` bytes apart (negative for
  // bottom-up rows), each at least width * bytesPerPixel bytes long. Returns 23 without touching
  // the pixels when the size is outside 1..64; otherwise 0, and the pixels are left untouched
  // when `pixels` is null, width or height is below 1, bytesPerPixel is below 3, |pitch| is
  // shorter than a row, or the rows span more than INT_MAX bytes.
  int doLUT(unsigned char* pixels, int width, int height, int pitch, int bytesPerPixel);

  // A deep copy without the row table. The copy becomes the process-wide instance.
  CubeLut* clone();
  // Size N with the lattice (i, j, k) * 255 / 31: the identity only for N = 32.
  void generateLUT3DData(int n);
  // Copies the byte atlas into the lattice, once, after something set the atlas state to 0.
  void updateLUT3DData();
  // generateLUT3DData's pattern again, in integer arithmetic, for the current size.
  void reset();
  // Writes one byte-atlas point; k is the blue index, i the red index.
  void updateCalcuatedData(int k, int j, int i, const PR& p);

  float* getFTData(int* count);
  int* getGTData(int* count);
  float* getLut3DData(int* width, int* height, int* depth, int* channels);
  // The lattice as bytes in the OpenCL upload layout: 8*N texels wide, ceil(N/8)*N rows, three
  // bytes per texel. Blue slice k is the tile at column k % 8, tile row k / 8; inside it x is the
  // red index and y the green index. *bytes receives its size, 8N * ceil(N/8)N * 3.
  const uint8_t* getAtlasData(int* bytes) const;

  // Attaches a raw table of rows (allocated with array new; the object frees it). While one is
  // attached the ".CUBE" reader fills its first N rows instead of the lattice, unscaled, and doLUT
  // does nothing. Null detaches (and frees) it.
  void setRowTable(float (*rows)[3]);
  float (*getRowTable())[3] { return rowTable_; }

 protected:
  // An object that never becomes the process-wide instance, for owners that must not be reached
  // or destroyed through getInstance() and releaseInstance().
  struct Unlisted {};
  explicit CubeLut(Unlisted);

 private:
  void buildTables();  // fraction and grid index tables from size_
  int atlasIndex(int i, int j, int k) const;
  // What both readers do first: status 0, no title, the default domain, a zeroed lattice.
  void beginRead();
  void allocateAtlas();  // frees the atlas and allocates a zeroed tile image for size_

  int32_t status_;
  std::string title_;
  int32_t size_;
  float ft_[256];    // position of each byte value inside its lattice cell
  int32_t gt_[256];  // lower lattice index of each byte value
  float lattice_[kMaxSize][kMaxSize][kMaxSize][3];
  float (*rowTable_)[3];
  uint8_t* atlas_;
  int32_t pointCount_;
  int32_t atlasState_;
  float domainMin_[3];
  float domainMax_[3];
  int32_t atlasBytes_;  // what atlas_ was allocated with, which a kept atlas may not match

  // Atomic so that effects building their own tables on several render threads do not race on
  // it; the object it points at is still only safe for one thread at a time.
  static std::atomic<CubeLut*> mLut3d;
};
