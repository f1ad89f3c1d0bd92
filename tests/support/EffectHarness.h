// Creating an effect the way a host does: settings carrying double parameters, then the filter
// by its GUID.
#pragma once

#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "support/ImageBuilders.h"
#include "support/TestFrame.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace tfx_test {

// The published GUIDs, in the registry's order.
constexpr const wchar_t* kColorAdjust = L"18C6E879-4138-42D0-B0B9-6B4401AA97E6";
constexpr const wchar_t* kWhiteBalance = L"39509FB9-39FB-4516-9464-3D891DD61D62";
constexpr const wchar_t* kCombine = L"41AA934B-757A-4EAD-8F7B-85E2E2952B6A";
constexpr const wchar_t* kLut = L"74EB022D-1D73-4D1E-9F70-487C356D46CD";
constexpr const wchar_t* kVignette = L"8622FC58-4DF1-44BD-9B37-2F633D4D3368";
constexpr const wchar_t* kAToWhite = L"969C6D5D-43AC-42F9-8F6C-9AB868BA9356";
constexpr const wchar_t* kHsl = L"AF91FF05-6577-4A4B-C81E-652EE7D6596E";
constexpr const wchar_t* kLens = L"CFAAD60B-AC2B-4B39-A8E1-D25E35A6F735";
constexpr const wchar_t* kLight = L"D8651B53-F47A-4B98-B8E9-35B491D5EADC";
constexpr const wchar_t* kChromeKey = L"DB4BBA18-48FC-4164-B572-E59757B02796";
constexpr const wchar_t* kGuids[] = {kColorAdjust, kWhiteBalance, kCombine, kLut,   kVignette,
                                     kAToWhite,    kHsl,          kLens,    kLight, kChromeKey};

using EffectParams = std::vector<std::pair<std::wstring, double>>;

// Host settings carrying double parameters (default 0) the way a host's UI writes them.
NLEComPtr<INLEProperties> Settings(const EffectParams& values);

// Host settings with one text parameter, `name` = `value`.
NLEComPtr<INLEProperties> TextSettings(const wchar_t* name, const std::wstring& value);

// The effect `guid` built from `settings`; a failure to create it fails the running test.
NLEComPtr<INLECGFilter> CreateEffect(const wchar_t* guid, INLEProperties* settings);

// Noise in every byte of the frame, padding included.
void FillRandom(TestFrame* frame, unsigned salt);

// One frame through `filter` as a host runs it: `fg` as the foreground and `bg` (where given) as
// the background, into `dst`. The frames are held for the call. Returns the destination's bytes;
// the result code lands in *status, or must be success.
Bytes RunFrame(INLECGFilter* filter, TestFrame* fg, TestFrame* dst, TestFrame* bg = nullptr,
               HRESULT* status = nullptr);

// Changes one parameter of a live filter as a host's UI does: its current value, then
// ParamValueChanged.
void SetParam(INLECGFilter* filter, const wchar_t* name, double value);

// Runs `filter` on a `width` x `height` foreground of random pixels (`fgHeight` rows of it where
// that is not 0, to feed a taller frame) and a background it must not read, into a destination
// whose rows are `dstStride` bytes apart (0: packed), and expects the bytes `imageForm` makes of
// a packed BGRA copy of the foreground, which must differ from it.
void ExpectMatchesImageForm(INLECGFilter* filter, int width, int height, int dstStride,
                            const std::function<void(CxImage*)>& imageForm, int fgHeight = 0);

// Runs `filter` with a background and no foreground: an effect that reads the foreground must
// refuse with 0x80000003 and leave the destination unwritten.
void ExpectRefusesMissingForeground(INLECGFilter* filter);

// Collects what the default logger writes, at `level` and above, while it lives.
struct LogCapture {
  explicit LogCapture(int32_t level = kNLELogInfo);
  ~LogCapture();
  std::vector<std::pair<int32_t, std::wstring>> lines;
  int32_t saved;
};

}  // namespace tfx_test
