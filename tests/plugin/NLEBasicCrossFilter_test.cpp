#include "plugin/NLEBasicCrossFilter.h"

#include <gtest/gtest.h>

#include <cstring>

#include "support/EffectHarness.h"
#include "support/OpenCLHarness.h"
#include "support/TestFrame.h"

namespace {

using tfx_test::Bytes;
using tfx_test::kAToWhite;
using tfx_test::kChromeKey;
using tfx_test::kLut;
using tfx_test::kWhiteBalance;

// A real device whose memory manager counts what the plug-in makes and frees.
class CountingDevice final : public scombase::CUnknown,
                             public INLECGDevice,
                             public INLECGOpenCLOperate,
                             public OPENCL::openclMemManager {
 public:
  explicit CountingDevice(INLECGDevice* real) : CUnknown(L"CountingDevice", nullptr), real_(real) {
    tfx_test::OpenCLHandles(real, &programs_, &memory_);
  }
  NLE_DECLARE_IUNKNOWN
  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override {
    if (iid == IID_INLECGDevice) return GetInterface(static_cast<INLECGDevice*>(this), out);
    if (iid == IID_INLECGOpenCLOperate)
      return GetInterface(static_cast<INLECGOpenCLOperate*>(this), out);
    return CUnknown::NonDelegatingQueryInterface(iid, out);
  }
  HRESULT GetName(wchar_t* buf, uint32_t capacity) override {
    return real_->GetName(buf, capacity);
  }
  HRESULT GetOpenCLHandles(void** manager, void** memory) override {
    *manager = programs_;
    *memory = static_cast<OPENCL::openclMemManager*>(this);
    return NLE_S_OK;
  }

  bool createOpenCLMem(OPENCL::MemoryType type, int size, const void* init,
                       OPENCL::openclMemory** out) override {
    ++creates;
    return memory_->createOpenCLMem(type, size, init, out);
  }
  bool createOpenCLFrameMem(int width, int height, OPENCL::MemoryKind kind, const void* bgra,
                            int stride, OPENCL::openclMemory** out) override {
    return memory_->createOpenCLFrameMem(width, height, kind, bgra, stride, out);
  }
  void releaseOpenCLMem(OPENCL::openclMemory* memory) override {
    releases += memory ? 1 : 0;
    memory_->releaseOpenCLMem(memory);
  }

  int creates = 0;
  int releases = 0;

 private:
  NLEComPtr<INLECGDevice> real_;
  OPENCL::openclProgramManager* programs_ = nullptr;
  OPENCL::openclMemManager* memory_ = nullptr;
};

using CrossFilter = tfx_test::OpenCLEffectTest;

TEST_F(CrossFilter, RunningNeedsABoundFilterAndADeviceDestination) {
  NLEBasicCrossFilter* unbound = NLEBasicCrossFilter::create(kAToWhite);
  ASSERT_NE(unbound, nullptr);
  NLEComPtr<INLECGFilter> hold(unbound);
  NLEComPtr<INLEOpenCLFrame> src = DeviceFrame(4, 2, Bytes(32, 7));
  NLEComPtr<INLEOpenCLFrame> dst = DeviceFrame(4, 2);
  unbound->SetForeground(src.get());
  EXPECT_EQ(unbound->Running(nullptr), NLE_E_INVALIDARG);
  EXPECT_EQ(unbound->Running(dst.get()), NLE_E_RESOURCE);  // before InitFilter

  NLEComPtr<INLECGFilter> filter = CreateOnDevice(kAToWhite, nullptr);
  ASSERT_TRUE(filter);
  filter->SetForeground(src.get());
  // Destinations without device memory: a memory frame, and a mapped surface.
  NLEComPtr<TestFrame> memory(new TestFrame(4, 2, 0, false, 9));
  NLEComPtr<TestFrame> mapped(new TestFrame(4, 2, 0, true, 9));
  EXPECT_EQ(filter->Running(memory.get()), NLE_E_INVALIDARG);
  EXPECT_EQ(filter->Running(mapped.get()), NLE_E_INVALIDARG);
  EXPECT_EQ(memory->pixels, Bytes(32, 9));
  EXPECT_EQ(mapped->surfaceReleases, 1);  // the surface was given back
  // No source frame at all, and a source of another size.
  filter->SetForeground(nullptr);
  EXPECT_EQ(filter->Running(dst.get()), NLE_E_RESOURCE);
  NLEComPtr<INLEOpenCLFrame> other = DeviceFrame(2, 4);
  filter->SetForeground(other.get());
  EXPECT_EQ(filter->Running(dst.get()), NLE_E_INVALIDARG);
  // The background serves when it is the only device frame.
  filter->SetForeground(memory.get());
  filter->SetBackground(src.get());
  EXPECT_EQ(filter->Running(dst.get()), NLE_S_OK);
  EXPECT_EQ(Download(dst.get()), Bytes(32, 7));
}

// Filters on one device share their program: a later one finds it built, so a directory without
// the source is no obstacle, and each runs with its own kernel objects. A fresh device has none of
// the programs yet, and no kernel directory to build them from.
TEST_F(CrossFilter, EveryOpenCLClassIsCreatedWithTheShippedKernelsAndSharesItsProgram) {
  OPENCL::openclProgramManager* manager = nullptr;
  OPENCL::openclMemManager* memory = nullptr;
  ASSERT_NO_FATAL_FAILURE(Handles(&manager, &memory));
  EXPECT_EQ(manager->getOpenCLProgram("lutAToWhiteEffect"), nullptr);
  NLEComPtr<INLECGFilter> first, second, key;
  for (const wchar_t* guid : {kAToWhite, kWhiteBalance, kLut, kChromeKey}) {
    NLEComPtr<INLECGFilter> filter;
    ASSERT_EQ(CreateFilterFromGUID(device_.get(), guid, nullptr, TFX_KERNEL_DIR,
                                   reinterpret_cast<void**>(&filter)),
              NLE_S_OK);
    ASSERT_NE(dynamic_cast<NLEBasicCrossFilter*>(filter.get()), nullptr);  // not the CPU class
    if (guid == kAToWhite) first = filter;
  }
  OPENCL::openclProgram* program = manager->getOpenCLProgram("lutAToWhiteEffect");
  ASSERT_NE(program, nullptr);
  EXPECT_TRUE(program->isLoaded());
  ASSERT_EQ(CreateFilterFromGUID(device_.get(), kAToWhite, nullptr, "/nonexistent",
                                 reinterpret_cast<void**>(&second)),
            NLE_S_OK);
  EXPECT_EQ(manager->getOpenCLProgram("lutAToWhiteEffect"), program);
  // The LUT and chroma-key classes share "LUT" the same way.
  EXPECT_EQ(CreateFilterFromGUID(device_.get(), kChromeKey, nullptr, "/nonexistent",
                                 reinterpret_cast<void**>(&key)),
            NLE_S_OK);
  Bytes pixels = {1, 2, 3, 0, 4, 5, 6, 7};
  EXPECT_EQ(RunOnDevice(first.get(), pixels, 2, 1), (Bytes{0, 0, 0, 255, 4, 5, 6, 7}));
  EXPECT_EQ(RunOnDevice(second.get(), pixels, 2, 1), (Bytes{0, 0, 0, 255, 4, 5, 6, 7}));

  NLEComPtr<INLECGDevice> fresh;
  ASSERT_EQ(NLECommon::CreateOpenCLDevice(-1, &fresh), NLE_S_OK);
  void* filter = nullptr;
  EXPECT_EQ(CreateFilterFromGUID(fresh.get(), kWhiteBalance, nullptr, "/nonexistent", &filter),
            NLE_E_INVALIDARG);
  EXPECT_EQ(filter, nullptr);
}

// Exposes the parameter block's device memory.
class ParamProbe final : public NLEBasicCrossFilter {
 public:
  using NLEBasicCrossFilter::ParamMemory;
};

template <typename T>
T At(const Bytes& block, size_t offset) {
  T v;
  std::memcpy(&v, block.data() + offset, sizeof v);
  return v;
}

TEST_F(CrossFilter, TheParameterBlockIsUploadedOnlyWhenItChanges) {
  CountingDevice* counting = new CountingDevice(device_.get());
  NLEComPtr<INLECGDevice> device(counting);
  OPENCL::openclProgramManager* programs = nullptr;
  OPENCL::openclMemManager* memory = nullptr;
  ASSERT_NO_FATAL_FAILURE(Handles(&programs, &memory));
  OPENCL::openclMemory *a = nullptr, *b = nullptr;
  ASSERT_TRUE(memory->createOpenCLFrameMem(6, 3, OPENCL::kMemoryFrameBuffer, nullptr, 0, &a));
  ASSERT_TRUE(memory->createOpenCLFrameMem(5, 7, OPENCL::kMemoryFrameBuffer, nullptr, 0, &b));
  {
    NLEComPtr<ParamProbe> probe(new ParamProbe());
    EXPECT_EQ(probe->CallParam(nullptr, nullptr), NLE_E_RESOURCE);  // not bound to a device
    ASSERT_EQ(probe->InitFilter(device.get(), ""), NLE_S_OK);
    NLERational rate{30000, 1001};
    probe->SetFramerate(rate);
    probe->SetCurrentTime(90);
    probe->SetTotalTime(300);
    probe->SetRegionOfIntrest({0.25, 0.5, 0.5, 0.25}, {0.125, 0.0, 1.0, 0.75});
    probe->SetAngle(30.0);
    ASSERT_EQ(probe->CallParam(a, b), NLE_S_OK);
    OPENCL::openclMemory* block = probe->ParamMemory();
    ASSERT_NE(block, nullptr);
    ASSERT_EQ(block->getOpenCLMemoryInfo().size, 108u);
    Bytes bytes(108);
    const auto read = [&] {
      EXPECT_TRUE(block->readDataFromOpenCLMemory(reinterpret_cast<char*>(bytes.data()), 108, 0,
                                                  true, nullptr));
    };
    read();
    EXPECT_EQ(At<int32_t>(bytes, 0), 6);
    EXPECT_EQ(At<int32_t>(bytes, 4), 5);
    EXPECT_EQ(At<int32_t>(bytes, 32), 3);
    EXPECT_EQ(At<int32_t>(bytes, 36), 7);
    EXPECT_EQ(At<float>(bytes, 64), static_cast<float>(90 / (30000.0 / 1001.0)));
    EXPECT_EQ(At<float>(bytes, 68), static_cast<float>(300 / (30000.0 / 1001.0)));
    EXPECT_EQ(At<float>(bytes, 72), 0.125f);  // inner region first
    EXPECT_EQ(At<float>(bytes, 84), 0.75f);
    EXPECT_EQ(At<float>(bytes, 88), 0.25f);  // then the region of interest
    EXPECT_EQ(At<float>(bytes, 100), 0.25f);
    EXPECT_EQ(At<float>(bytes, 104), 30.0f);
    for (size_t zero : {8u, 28u, 40u, 60u}) EXPECT_EQ(At<int32_t>(bytes, zero), 0) << zero;

    // The same block again is not uploaded, so bytes scribbled over the device's copy stay; a
    // changed one is, into the same memory.
    const Bytes scribble(108, 0xAB);
    const auto uploads = [&](OPENCL::openclMemory* x, OPENCL::openclMemory* y) {
      EXPECT_TRUE(block->writeData2OpenCLMemory(reinterpret_cast<const char*>(scribble.data()), 108,
                                                0, true, nullptr));
      EXPECT_EQ(probe->CallParam(x, y), NLE_S_OK);
      read();
      return bytes != scribble;
    };
    EXPECT_FALSE(uploads(a, b));
    probe->SetCurrentTime(91);
    EXPECT_TRUE(uploads(a, b));
    EXPECT_EQ(At<float>(bytes, 64), static_cast<float>(91 / (30000.0 / 1001.0)));
    EXPECT_FALSE(uploads(a, b));
    EXPECT_TRUE(uploads(b, nullptr));  // the sizes are part of the block
    EXPECT_EQ(counting->creates, 1);
    EXPECT_EQ(At<int32_t>(bytes, 0), 5);
    EXPECT_EQ(At<int32_t>(bytes, 4), 0);
  }
  EXPECT_EQ(counting->releases, 1);  // the filter gave its block back to the device's manager
  memory->releaseOpenCLMem(a);
  memory->releaseOpenCLMem(b);
}

TEST_F(CrossFilter, LutTablesGoUpOnlyWhenTheTablesChange) {
  CountingDevice* counting = new CountingDevice(device_.get());
  NLEComPtr<INLECGDevice> device(counting);
  // The class registers no parameters: a host hands them over with its settings.
  NLEComPtr<INLEProperties> settings = tfx_test::Settings({{L"green", 255}, {L"contrast", 50}});
  NLEComPtr<INLECGFilter> key;
  ASSERT_EQ(CreateFilterFromGUID(device.get(), kChromeKey, settings.get(), TFX_KERNEL_DIR,
                                 reinterpret_cast<void**>(&key)),
            NLE_S_OK);
  Bytes pixels(16 * 4, 200);
  RunOnDevice(key.get(), pixels, 4, 4);
  EXPECT_EQ(counting->creates, 6);  // both tables' three buffers
  RunOnDevice(key.get(), pixels, 4, 4);
  EXPECT_EQ(counting->creates, 6);
  tfx_test::SetParam(key.get(), L"contrast", 70.0);  // the alpha table alone
  RunOnDevice(key.get(), pixels, 4, 4);
  EXPECT_EQ(counting->creates, 9);
  EXPECT_EQ(counting->releases, 3);
  key = nullptr;
  EXPECT_EQ(counting->releases, 9);
}

}  // namespace
