// The filter interface a host drives: frames in, parameters, timing, one Running call per frame.
//
// Threading: different filter objects may run on different threads at the same time; one
// filter object is called by one thread at a time.
#pragma once

#include <cstdint>

#include "tessarofx/NLEComBase.h"
#include "tessarofx/NLEFrame.h"
#include "tessarofx/NLEProperties.h"

extern "C++" {
TFX_HOST_API extern const IID IID_INLECGFilter;
}

struct NLERational {
  int64_t num;
  int64_t den;
};

// A rectangle relative to the frame: (0, 0, 1, 1) is the whole frame.
struct NLERectF {
  double x;
  double y;
  double width;
  double height;
};

struct NLESize {
  int32_t width;
  int32_t height;
};

struct NLERect {
  int32_t x;
  int32_t y;
  int32_t width;
  int32_t height;
};

// What the host tells a filter before a run of frames.
struct CGFilterParam {
  NLESize frameSize;    // size of the frames to come
  int32_t quality;      // 0 draft, 1 final render
  int32_t reserved[5];  // zero
};

struct INLECGFilter : IUnknown {
  // Input frames, borrowed (not counted) until replaced.
  virtual HRESULT SetBackground(INLEFrame* frame) = 0;
  virtual HRESULT SetForeground(INLEFrame* frame) = 0;
  virtual HRESULT SetTotalTime(int32_t t) = 0;    // t <= 0 is stored as 1
  virtual HRESULT SetCurrentTime(int32_t t) = 0;  // stored unchanged
  virtual HRESULT SetFramerate(NLERational& rate) = 0;
  virtual HRESULT SetRegionOfIntrest(const NLERectF& roi, const NLERectF& inner) = 0;
  virtual HRESULT GetRegionOfInterest(NLERectF* roi, NLERectF* inner) = 0;
  virtual HRESULT Prepare(CGFilterParam param) = 0;
  // Renders into dst from the background and foreground frames.
  virtual HRESULT Running(INLEFrame* dst) = 0;
  virtual HRESULT Update(INLEFrame* dst, INLEProperties* in, INLEProperties* out) = 0;
  virtual HRESULT CalcROD(NLESize size, NLERect& rod) = 0;
  virtual int32_t GetParamCount() = 0;
  virtual HRESULT GetParamProperty(int32_t index, INLEProperties** param) = 0;
  virtual HRESULT GetParamPropertyFromName(const wchar_t* name, INLEProperties** param) = 0;
  virtual HRESULT SetAngle(double angle) = 0;
  virtual HRESULT GetAngle(double* angle) = 0;
  // Call after changing parameter values in the filter's bag (QueryInterface for
  // IID_INLEProperties gives it).
  virtual HRESULT ParamValueChanged() = 0;
  // True when the filter would leave frames unchanged and the host may skip it.
  virtual bool IsPassthrough() = 0;

 protected:
  ~INLECGFilter() = default;
};
