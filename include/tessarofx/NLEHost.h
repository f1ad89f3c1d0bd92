// Services of the host kit (libTessaroFxHost.so): the class factory, the environment service,
// the default logger and CPU memory frames. The plug-in uses the factory, the environment and
// the logger; a host uses all of them.
#pragma once

#include <cstdarg>
#include <cstdint>

#include "tessarofx/NLEComBase.h"
#include "tessarofx/NLEFrame.h"
#include "tessarofx/NLEProperties.h"

extern "C++" {
TFX_HOST_API extern const CLSID CLSID_NLEEnviroment;
TFX_HOST_API extern const IID IID_INLEEnviroment;
TFX_HOST_API extern const CLSID CLSID_NLEMemoryFrame;
}

// The host's environment: how paths named in filter parameters become file-system paths.
struct INLEEnviroment : IUnknown {
  // Translates `path` into a file-system path:
  //   - a leading "~" followed by "/" or the end is replaced by $HOME;
  //   - "${NAME}" and "$NAME" (NAME of letters, digits and '_') are replaced by the value of the
  //     environment variable NAME, or by nothing when it is unset; "$$" gives one "$";
  //   - anything else is kept as it is, so a plain absolute path comes back unchanged.
  // The result goes to out (at most capacity - 1 characters and a terminating zero); *needed,
  // when given, receives the full length. NLE_E_INVALIDARG for a null path;
  // NLE_E_OUTOFMEMORY (with *needed set) when capacity is too small.
  virtual HRESULT TranslatePath(const wchar_t* path, wchar_t* out, uint32_t capacity,
                                uint32_t* needed) = 0;

 protected:
  ~INLEEnviroment() = default;
};

// A CPU memory frame the host can create and fill. Storage kind 0.
// A frame with no pixels (width or height 0, as a frame is before Allocate) is valid: GetPixels
// succeeds with a null pointer, Prepare succeeds, and its buffer reports a size of 0.
struct INLEMemoryFrame : INLEFrame {
  // (Re)allocates the frame: width x height pixels, rows `stride` bytes apart (0: packed,
  // width * 4). Storage is allocated lazily by Prepare or by the first GetPixels. Fails with
  // NLE_E_INVALIDARG for negative sizes or a stride below width * 4.
  virtual HRESULT Allocate(int32_t width, int32_t height, int32_t stride,
                           NLEFrameOrientation orientation) = 0;
  // Makes the frame a view of memory the caller owns and keeps alive while the frame uses it.
  virtual HRESULT Wrap(uint8_t* pixels, int32_t width, int32_t height, int32_t stride,
                       NLEFrameOrientation orientation) = 0;

 protected:
  ~INLEMemoryFrame() = default;
};

extern "C++" {
TFX_HOST_API extern const IID IID_INLEMemoryFrame;
}

namespace NLECommon {
// Creates a host object by class identifier and asks it for `iid`. `outer` aggregates the new
// object (then iid must be IID_IUnknown); `context` is reserved (0). Known classes:
// CLSID_NLEProperties, CLSID_NLEEnviroment (one shared instance), CLSID_NLEMemoryFrame.
TFX_HOST_API HRESULT GetInterface(REFCLSID clsid, IUnknown* outer, uint32_t context, REFIID iid,
                                  void** out);
// Creates an empty property bag.
TFX_HOST_API HRESULT CreateProperties(INLEProperties** out);
// Creates a packed CPU frame of width x height pixels (stride 0: width * 4).
TFX_HOST_API HRESULT CreateMemoryFrame(int32_t width, int32_t height, int32_t stride,
                                       INLEMemoryFrame** out);
}  // namespace NLECommon

// Log levels: a message is written when its level is at or above the logger's threshold.
enum NLELogLevel : int32_t {
  kNLELogTrace = 0,
  kNLELogDebug = 16,
  kNLELogInfo = 32,  // filter creation is logged at this level
  kNLELogWarning = 48,
  kNLELogError = 64,
  kNLELogOff = 1 << 30,
};

// Receives each formatted message (without a trailing newline).
typedef void (*NLELogSink)(void* context, int32_t level, const wchar_t* message);

class INLELogger {
 public:
  virtual bool IsLevelEnabled(int32_t level) = 0;
  // printf-style wide formatting ("%ls" for wide strings, "%d", ...).
  virtual void Log(int32_t level, const wchar_t* format, ...) = 0;
  virtual void LogV(int32_t level, const wchar_t* format, va_list args) = 0;
  // Messages below `level` are dropped; kNLELogOff silences the logger.
  virtual void SetLevel(int32_t level) = 0;
  virtual int32_t GetLevel() = 0;
  // Installs a sink (null restores the default, which writes "[level] message" lines to stderr).
  virtual void SetSink(NLELogSink sink, void* context) = 0;

 protected:
  ~INLELogger() = default;
};

// The process-wide logger. Its initial level comes from the environment variable
// TESSAROFX_LOG_LEVEL (a number, or "off"); 32 when unset. Safe to use from any thread.
extern "C" TFX_HOST_API INLELogger* NLEGetDefaultLogger();
