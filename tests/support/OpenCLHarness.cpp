#include "support/OpenCLHarness.h"

#include <cstdlib>

#include "support/EffectHarness.h"

namespace tfx_test {

void OpenCLEffectTest::SetUp() {
  if (OpenCLDevices().empty()) GTEST_SKIP() << "no OpenCL platform or device on this machine";
  ASSERT_EQ(NLECommon::CreateOpenCLDevice(-1, &device_), NLE_S_OK);
}

NLEComPtr<INLECGFilter> OpenCLEffectTest::CreateOnDevice(const wchar_t* guid,
                                                         INLEProperties* settings) {
  NLEComPtr<INLECGFilter> filter;
  EXPECT_EQ(CreateFilterFromGUID(device_.get(), guid, settings, TFX_KERNEL_DIR,
                                 reinterpret_cast<void**>(&filter)),
            NLE_S_OK);
  return filter;
}

NLEComPtr<INLEOpenCLFrame> OpenCLEffectTest::DeviceFrame(int width, int height, const Bytes& bgra) {
  NLEComPtr<INLEOpenCLFrame> frame;
  EXPECT_EQ(NLECommon::CreateOpenCLFrame(device_.get(), width, height, OPENCL::kMemoryFrameBuffer,
                                         &frame),
            NLE_S_OK);
  if (frame && !bgra.empty()) {
    EXPECT_EQ(frame->Upload(bgra.data(), 0), NLE_S_OK);
  }
  return frame;
}

void OpenCLHandles(INLECGDevice* device, OPENCL::openclProgramManager** programs,
                   OPENCL::openclMemManager** memory) {
  *programs = nullptr;
  *memory = nullptr;
  NLEComPtr<INLECGOpenCLOperate> operate;
  ASSERT_EQ(device->QueryInterface(IID_INLECGOpenCLOperate, reinterpret_cast<void**>(&operate)),
            NLE_S_OK);
  void* p = nullptr;
  void* m = nullptr;
  ASSERT_EQ(operate->GetOpenCLHandles(&p, &m), NLE_S_OK);
  *programs = static_cast<OPENCL::openclProgramManager*>(p);
  *memory = static_cast<OPENCL::openclMemManager*>(m);
}

Bytes OpenCLEffectTest::Download(INLEOpenCLFrame* frame) {
  NLEFrameDesc desc{};
  EXPECT_EQ(frame->GetDescription(&desc, false, false), NLE_S_OK);
  Bytes out(static_cast<size_t>(desc.width) * static_cast<size_t>(desc.height) * 4);
  EXPECT_EQ(frame->Download(out.data(), 0), NLE_S_OK);
  return out;
}

Bytes OpenCLEffectTest::RunOnDevice(INLECGFilter* filter, const Bytes& src, int width, int height,
                                    HRESULT* status, uint8_t dstFill) {
  NLEComPtr<INLEOpenCLFrame> in = DeviceFrame(width, height, src);
  NLEComPtr<INLEOpenCLFrame> out =
      DeviceFrame(width, height, Bytes(static_cast<size_t>(width) * height * 4, dstFill));
  filter->SetForeground(in.get());
  const HRESULT hr = filter->Running(out.get());
  filter->SetForeground(nullptr);
  if (status) {
    *status = hr;
  } else {
    EXPECT_EQ(hr, NLE_S_OK);
  }
  return Download(out.get());
}

Bytes OpenCLEffectTest::RunOnCpu(INLECGFilter* filter, const Bytes& src, int width, int height) {
  const Bytes out =
      RunFrame(filter, new TestFrame(width, height, src), new TestFrame(width, height));
  filter->SetForeground(nullptr);
  return out;
}

ByteDiff CompareBytes(const Bytes& a, const Bytes& b) {
  ByteDiff d;
  if (a.size() != b.size()) return {256, a.size() > b.size() ? a.size() : b.size()};
  for (size_t i = 0; i < a.size(); ++i) {
    const int diff = std::abs(int{a[i]} - int{b[i]});
    if (diff == 0) continue;
    ++d.count;
    if (diff > d.largest) d.largest = diff;
  }
  return d;
}

}  // namespace tfx_test
