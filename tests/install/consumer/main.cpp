// One call into each linked library: a bag from the host kit, a clamp from the image functions.
#include <tessarofx/HostKit.h>
#include <tessarofx/ImageFunctions.h>

#include <cstdio>

int main() {
  NLEComPtr<INLEProperties> bag;
  const HRESULT hr = NLECommon::CreateProperties(&bag);
  std::printf("host kit: %s, image functions: %d\n", NLEResultText(hr), ClampToByte(300));
  return NLE_SUCCEEDED(hr) && bag && ClampToByte(300) == 255 ? 0 : 1;
}
