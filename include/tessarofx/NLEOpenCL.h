// The host kit's OpenCL acceleration classes (libTessaroFxHost.so), the compute device that hands
// them to filters, and frames whose pixels live in device memory.
//
// A device (NLECommon::CreateOpenCLDevice) owns one context and one in-order command queue, one
// program manager and one memory manager; INLECGOpenCLOperate::GetOpenCLHandles gives the last
// two as OPENCL::openclProgramManager* and OPENCL::openclMemManager*. Programs are shared by name
// per manager and live as long as the device; kernels are cached per program. Memory objects
// belong to whoever created them and are freed with openclMemManager::releaseOpenCLMem.
//
// Threading: one thread at a time per device, like the rest of the kit's objects. No call throws;
// failures come back as false or null, and program build errors are also logged (with the
// compiler's log) through NLEGetDefaultLogger at kNLELogError.
#pragma once

#include <cstddef>
#include <cstdint>

#include "tessarofx/NLEComBase.h"
#include "tessarofx/NLEFrame.h"

// The OpenCL queue handle, declared exactly as <CL/cl.h> declares it, so that this header needs
// no OpenCL headers.
typedef struct _cl_command_queue* cl_command_queue;

namespace OPENCL {

// Pure interfaces, like the INLE ones: nothing of them is exported, so that every library that
// includes this header keeps their type information to itself.
class openclKernel;
class openclMemory;

// What openclKernel::setKernelParameters receives through `value`.
enum DataType : int32_t {
  // A plain value of `size` bytes copied into the argument: 4 for a 32-bit float or int, also
  // 1, 2, 8 or the size of a struct the kernel declares by value.
  kDataScalar = 9,
  // `value` points to an openclMemory*; `size` is 8 (the size of a memory handle).
  kDataMemory = 13,
  // Kernel-local scratch of `size` bytes for a __local pointer argument; `value` is ignored.
  kDataLocal = 14,
};

// Memory kinds openclMemManager::createOpenCLMem makes. The values are whole codes, not bit sets;
// any other value is refused.
enum MemoryType : int32_t {
  kMemBufferReadWrite = 0x1000,  // kernels read and write; initial bytes copied when given
  kMemBufferReadOnly = 0x1001,   // kernels only read; initial bytes copied when given
  kMemBufferWriteOnly = 0x1002,  // kernels only write; initial bytes copied when given
  // 4336: the plug-in's parameter block. Read-only for kernels and created by copying the
  // initial bytes (CL_MEM_READ_ONLY | CL_MEM_COPY_HOST_PTR), which are therefore required.
  kMemParamBlock = 0x10F0,
};

// How a frame's pixels are laid out on the device.
enum MemoryKind : int32_t {
  kMemoryBuffer = 0,       // plain bytes; width is the size in bytes, height 1
  kMemoryFrameBuffer = 1,  // BGRA8 pixels as a buffer, rows `rowPitch` bytes apart
  kMemoryImage2D = 2,      // a 2D image of channel order BGRA, 8-bit normalised channels
};

struct openclMemoryInfo {
  int32_t width;    // pixels (bytes for kMemoryBuffer)
  int32_t height;   // rows (1 for kMemoryBuffer)
  size_t rowPitch;  // bytes from one row to the next; whole images move as packed rows of this
  size_t size;      // bytes in all (rowPitch * height)
  MemoryKind kind;
};

class openclMemory {
 public:
  virtual openclMemoryInfo getOpenCLMemoryInfo() const = 0;
  // Device-side copy of `source` into this memory when `copy` is set and a source of the same
  // kind and size is given (false otherwise). Without a source, or with `copy` clear, this memory
  // is filled with zeros (transparent black for frames). Waits for the copy to finish.
  virtual bool copyToMemory(openclMemory* source, bool copy) = 0;
  // Device-side copy of all of `source` into this memory; false when the two differ in kind or
  // size. Waits for the copy to finish.
  virtual bool copyFromMemory(openclMemory* source) = 0;
  // Uploads `size` bytes at byte `offset`. Buffers take any range inside them. Images take whole
  // rows packed at rowPitch: offset and size must be multiples of it. `queue` null uses the
  // device's queue; a non-blocking write must keep `data` alive until the queue finishes.
  virtual bool writeData2OpenCLMemory(const char* data, size_t size, size_t offset, bool blocking,
                                      cl_command_queue queue) = 0;
  // The reverse of writeData2OpenCLMemory, with the same rules on ranges.
  virtual bool readDataFromOpenCLMemory(char* data, size_t size, size_t offset, bool blocking,
                                        cl_command_queue queue) = 0;
  // The cl_mem handle, for hosts that mix in their own OpenCL calls (not retained).
  virtual void* getNativeHandle() const = 0;

 protected:
  ~openclMemory() = default;
};

class openclMemManager {
 public:
  // Allocates `size` bytes of `type`, copying `size` bytes from `init` when given. False (and
  // *out null) for an unknown type, a size below 1, or a parameter block without `init`.
  virtual bool createOpenCLMem(MemoryType type, int size, const void* init, openclMemory** out) = 0;
  // Allocates a width x height BGRA8 frame of `kind` kMemoryFrameBuffer or kMemoryImage2D,
  // initialised from `bgra` (rows `stride` bytes apart, 0: packed) when given, else zeroed.
  virtual bool createOpenCLFrameMem(int width, int height, MemoryKind kind, const void* bgra,
                                    int stride, openclMemory** out) = 0;
  // Frees memory made by this manager; null is ignored.
  virtual void releaseOpenCLMem(openclMemory* memory) = 0;

 protected:
  ~openclMemManager() = default;
};

class openclKernel {
 public:
  // Sets argument `index`; see DataType for what `value` and `size` are. False when the runtime
  // refuses it (wrong size for the kernel's declaration, index out of range, ...).
  virtual bool setKernelParameters(int index, DataType kind, void* value, size_t size) = 0;
  // Enqueues one work item per element of a w x h range (w x h x d when d > 1) and, when `wait`
  // is set, waits for it to finish. False for an empty range or a runtime failure.
  virtual bool runKernel(unsigned w, unsigned h, unsigned d, bool wait) = 0;

 protected:
  ~openclKernel() = default;
};

class openclProgram {
 public:
  // Builds the program from `source` (`sourceLength` bytes, 0: up to its terminating zero) or,
  // when `source` is null, from the file <path>/<name>.cl. `options` go to the compiler (null:
  // none). A program that is already built stays as it is and answers true. False when the file
  // cannot be read or the build fails; the compiler's log is then written to the logger.
  virtual bool loadProgram(const char* path, const char* options, const char* source,
                           size_t sourceLength) = 0;
  virtual bool isLoaded() const = 0;
  virtual const char* getName() const = 0;
  // The kernel of that function name, made once and cached; null when the program is not built
  // or has no such kernel.
  virtual openclKernel* getopenclKernel(const char* name) = 0;
  // Runs one of this program's kernels over a w x h range in work-groups of localW x localH
  // (0 x 0: the runtime chooses) and, when `wait` is set, waits for it. False for a kernel of
  // another program, an empty range, a range the work-group does not divide, or a runtime failure.
  virtual bool runProgramKernel(openclKernel* kernel, unsigned w, unsigned h, unsigned localW,
                                unsigned localH, bool wait) = 0;

 protected:
  ~openclProgram() = default;
};

class openclProgramManager {
 public:
  // The program registered under `name`, or null.
  virtual openclProgram* getOpenCLProgram(const char* name) = 0;
  // A new empty program registered under `name`; null when the name is taken or empty.
  virtual openclProgram* createOpenCLProgram(const char* name) = 0;

 protected:
  ~openclProgramManager() = default;
};

}  // namespace OPENCL

// A frame whose pixels live in device memory (storage kind 32). GetSurface gives a surface of
// kind kNLESurfaceOpenCL whose GetDeviceMemory is the frame's OPENCL::openclMemory*; it is not
// mapped, so GetMappedPixels is null. GetPixels is not implemented; pixels move with Upload and
// Download instead.
struct INLEOpenCLFrame : INLEFrame {
  // Copies width x height BGRA pixels from `bgra`, rows `stride` bytes apart (0: packed).
  virtual HRESULT Upload(const uint8_t* bgra, int32_t stride) = 0;
  // Copies the frame's pixels to `bgra`, rows `stride` bytes apart (0: packed).
  virtual HRESULT Download(uint8_t* bgra, int32_t stride) = 0;

 protected:
  ~INLEOpenCLFrame() = default;
};

extern "C++" {
TFX_HOST_API extern const IID IID_INLEOpenCLFrame;
}

// One OpenCL device as the runtime lists it.
struct NLEOpenCLDeviceInfo {
  char platform[128];  // platform name, UTF-8, cut to fit
  char device[128];    // device name, UTF-8, cut to fit
  uint64_t type;       // the runtime's device type bits: 2 CPU, 4 GPU, 8 accelerator
};

namespace NLECommon {
// Lists every device of every platform, platform by platform, into out[0..capacity); *count
// receives how many there are (also when capacity is smaller). Zero devices when there is no
// OpenCL runtime at all. NLE_E_POINTER for a null count.
TFX_HOST_API HRESULT ListOpenCLDevices(NLEOpenCLDeviceInfo* out, uint32_t capacity,
                                       uint32_t* count);
// Opens device `index` of that list; -1 picks one: the index in the environment variable
// TESSAROFX_OPENCL_DEVICE when set, else the first GPU, else the first CPU, else the first
// device. NLE_E_INVALIDARG for an index out of range (or a malformed variable), NLE_E_RESOURCE
// when there is no device or the runtime fails to open it.
TFX_HOST_API HRESULT CreateOpenCLDevice(int32_t index, INLECGDevice** out);
// Creates a width x height frame in the device's memory, zeroed. `kind` is
// OPENCL::kMemoryFrameBuffer or OPENCL::kMemoryImage2D.
TFX_HOST_API HRESULT CreateOpenCLFrame(INLECGDevice* device, int32_t width, int32_t height,
                                       OPENCL::MemoryKind kind, INLEOpenCLFrame** out);
}  // namespace NLECommon
