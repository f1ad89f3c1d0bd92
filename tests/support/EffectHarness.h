// Creating an effect the way a host does: settings carrying double parameters, then the filter
// by its GUID.
#pragma once

#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "support/TestFrame.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace tfx_test {

using EffectParams = std::vector<std::pair<std::wstring, double>>;

// Host settings carrying double parameters (default 0) the way a host's UI writes them.
NLEComPtr<INLEProperties> Settings(const EffectParams& values);

// Host settings with one text parameter, `name` = `value`.
NLEComPtr<INLEProperties> TextSettings(const wchar_t* name, const std::wstring& value);

// The effect `guid` built from `settings`; a failure to create it fails the running test.
NLEComPtr<INLECGFilter> CreateEffect(const wchar_t* guid, INLEProperties* settings);

void FillRandom(TestFrame* frame, unsigned salt);

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

}  // namespace tfx_test
