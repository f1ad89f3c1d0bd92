#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <string>
#include <vector>

#include "support/EffectHarness.h"
#include "support/OpenCLHarness.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/NLEOpenCL.h"

namespace {

using tfx_test::OpenCLDevices;

std::string NameOf(INLECGDevice* device) {
  wchar_t name[128];
  EXPECT_EQ(device->GetName(name, 128), NLE_S_OK);
  return std::string(name, name + std::wcslen(name));  // device names are ASCII in practice
}

constexpr char kFillSource[] = R"(
kernel void fill_buffer(global uchar4* dst, int width, float k) {
  const int x = get_global_id(0), y = get_global_id(1);
  dst[y * width + x] = (uchar4)((uchar)k, (uchar)y, (uchar)x, 255);
}
kernel void fill_image(write_only image2d_t dst, float k) {
  const int x = get_global_id(0), y = get_global_id(1);
  write_imagef(dst, (int2)(x, y), (float4)(x / 255.0f, y / 255.0f, k / 255.0f, 1.0f));
}
kernel void copy_words(global const int* src, global int* dst) {
  dst[get_global_id(0)] = src[get_global_id(0)];
}
)";

// Every test runs on the device a host gets by default, with the selection variable unset.
class OpenCL : public tfx_test::OpenCLEffectTest {
 protected:
  void SetUp() override {
    OpenCLEffectTest::SetUp();
    if (IsSkipped() || HasFatalFailure()) return;
    Handles(&programs_, &memory_);
    ASSERT_TRUE(programs_ && memory_);
  }

  OPENCL::openclProgram* FillProgram() {
    OPENCL::openclProgram* program = programs_->createOpenCLProgram("fill");
    EXPECT_TRUE(program && program->loadProgram(nullptr, nullptr, kFillSource, 0));
    return program;
  }

  OPENCL::openclProgramManager* programs_ = nullptr;
  OPENCL::openclMemManager* memory_ = nullptr;
};

TEST_F(OpenCL, ProgramsAreSharedByNameBuiltOnceAndLogTheirErrors) {
  const std::string dir = testing::TempDir();
  const std::string file = dir + "/tfx_copy.cl";
  std::ofstream(file) << kFillSource;

  EXPECT_EQ(programs_->getOpenCLProgram("tfx_copy"), nullptr);
  OPENCL::openclProgram* program = programs_->createOpenCLProgram("tfx_copy");
  ASSERT_NE(program, nullptr);
  EXPECT_FALSE(program->isLoaded());
  EXPECT_EQ(program->getopenclKernel("copy_words"), nullptr);  // not built yet
  ASSERT_TRUE(program->loadProgram(dir.c_str(), nullptr, nullptr, 0));

  // A second filter finds the built program and loading it again builds nothing: the source
  // is gone, and it still succeeds.
  std::remove(file.c_str());
  EXPECT_EQ(programs_->getOpenCLProgram("tfx_copy"), program);
  EXPECT_EQ(programs_->createOpenCLProgram("tfx_copy"), nullptr);
  EXPECT_TRUE(program->isLoaded());
  EXPECT_TRUE(program->loadProgram(dir.c_str(), nullptr, nullptr, 0));
  EXPECT_STREQ(program->getName(), "tfx_copy");

  // Programs belong to one device's manager.
  NLEComPtr<INLECGDevice> other;
  ASSERT_EQ(NLECommon::CreateOpenCLDevice(-1, &other), NLE_S_OK);
  OPENCL::openclProgramManager* fresh = nullptr;
  OPENCL::openclMemManager* otherMemory = nullptr;
  ASSERT_NO_FATAL_FAILURE(tfx_test::OpenCLHandles(other, &fresh, &otherMemory));
  EXPECT_NE(fresh, programs_);
  EXPECT_EQ(fresh->getOpenCLProgram("tfx_copy"), nullptr);
  // ... where the file is now missing.
  tfx_test::LogCapture log;
  EXPECT_FALSE(fresh->createOpenCLProgram("tfx_copy")->loadProgram(dir.c_str(), 0, 0, 0));
  ASSERT_EQ(log.lines.size(), 1u);
  EXPECT_NE(log.lines[0].second.find(L"tfx_copy.cl"), std::wstring::npos);

  // A build error is logged with the compiler's log.
  OPENCL::openclProgram* bad = programs_->createOpenCLProgram("broken");
  ASSERT_NE(bad, nullptr);
  log.lines.clear();
  EXPECT_FALSE(bad->loadProgram(nullptr, nullptr,
                                "kernel void k(global int* p) { p[0] = undeclared_value; }", 0));
  EXPECT_FALSE(bad->isLoaded());
  EXPECT_EQ(bad->getopenclKernel("k"), nullptr);
  ASSERT_EQ(log.lines.size(), 1u);
  EXPECT_EQ(log.lines[0].first, kNLELogError);
  const std::wstring& message = log.lines[0].second;
  EXPECT_NE(message.find(L"\"broken\""), std::wstring::npos) << message.c_str();
  EXPECT_NE(message.find(L"undeclared_value"), std::wstring::npos) << message.c_str();
}

TEST_F(OpenCL, KernelsAreCachedCheckTheirArgumentsAndRunOverEveryPixelOfAFrame) {
  OPENCL::openclProgram* program = FillProgram();
  ASSERT_NE(program, nullptr);
  OPENCL::openclKernel* copy = program->getopenclKernel("copy_words");
  ASSERT_NE(copy, nullptr);
  EXPECT_EQ(program->getopenclKernel("copy_words"), copy);
  EXPECT_NE(program->getopenclKernel("fill_image"), copy);
  EXPECT_EQ(program->getopenclKernel("no_such_kernel"), nullptr);

  OPENCL::openclMemory* none = nullptr;
  EXPECT_FALSE(copy->setKernelParameters(0, OPENCL::kDataMemory, &none, 8));
  EXPECT_FALSE(copy->setKernelParameters(0, OPENCL::kDataMemory, nullptr, 8));
  EXPECT_FALSE(copy->setKernelParameters(7, OPENCL::kDataScalar, &none, 8));  // no argument 7
  EXPECT_FALSE(copy->setKernelParameters(0, static_cast<OPENCL::DataType>(3), &none, 8));
  EXPECT_FALSE(copy->runKernel(0, 1, 1, true));

  constexpr int kWidth = 37, kHeight = 5, kStride = kWidth * 4 + 8;
  for (OPENCL::MemoryKind kind : {OPENCL::kMemoryFrameBuffer, OPENCL::kMemoryImage2D}) {
    SCOPED_TRACE(kind == OPENCL::kMemoryImage2D ? "image" : "buffer");
    NLEComPtr<INLEOpenCLFrame> frame;
    ASSERT_EQ(NLECommon::CreateOpenCLFrame(device_, kWidth, kHeight, kind, &frame), NLE_S_OK);
    NLEFrameDesc desc{};
    ASSERT_EQ(frame->GetDescription(&desc, true, false), NLE_S_OK);
    EXPECT_EQ(desc.storage, kNLEFrameStorageSurface);
    uint8_t* pixels = nullptr;
    EXPECT_EQ(frame->GetPixels(&pixels), NLE_E_NOTIMPL);

    NLEComPtr<INLEFrameSurface> surface;
    ASSERT_EQ(frame->GetSurface(&surface), NLE_S_OK);
    EXPECT_EQ(surface->GetKind(), kNLESurfaceOpenCL);
    auto* memory = static_cast<OPENCL::openclMemory*>(surface->GetDeviceMemory());
    ASSERT_NE(memory, nullptr);
    EXPECT_EQ(memory->getOpenCLMemoryInfo().rowPitch, size_t{kWidth} * 4);

    float k = 200.0f;
    int width = kWidth;
    OPENCL::openclKernel* kernel =
        program->getopenclKernel(kind == OPENCL::kMemoryImage2D ? "fill_image" : "fill_buffer");
    ASSERT_NE(kernel, nullptr);
    ASSERT_TRUE(kernel->setKernelParameters(0, OPENCL::kDataMemory, &memory, 8));
    if (kind == OPENCL::kMemoryImage2D) {
      ASSERT_TRUE(kernel->setKernelParameters(1, OPENCL::kDataScalar, &k, 4));
    } else {
      ASSERT_TRUE(kernel->setKernelParameters(1, OPENCL::kDataScalar, &width, 4));
      ASSERT_TRUE(kernel->setKernelParameters(2, OPENCL::kDataScalar, &k, 4));
    }
    ASSERT_TRUE(kernel->runKernel(kWidth, kHeight, 1, true));
    EXPECT_EQ(frame->ReleaseSurface(surface), NLE_S_OK);

    std::vector<uint8_t> out(kStride * kHeight, 0xEE);
    ASSERT_EQ(frame->Download(out.data(), kStride), NLE_S_OK);
    for (int y = 0; y < kHeight; ++y) {
      for (int x = 0; x < kWidth; ++x) {
        const uint8_t* p = &out[y * kStride + x * 4];
        const uint8_t expected[4] = {200, static_cast<uint8_t>(y), static_cast<uint8_t>(x), 255};
        ASSERT_EQ(std::memcmp(p, expected, 4), 0) << "pixel " << x << "," << y;
      }
      for (int i = kWidth * 4; i < kStride; ++i) ASSERT_EQ(out[y * kStride + i], 0xEE);
    }
  }
}

TEST_F(OpenCL, FramesUploadCopyAndClear) {
  constexpr int kWidth = 6, kHeight = 3, kStride = 28;
  std::vector<uint8_t> in(kStride * kHeight);
  for (size_t i = 0; i < in.size(); ++i) in[i] = static_cast<uint8_t>(i * 7 + 1);
  for (OPENCL::MemoryKind kind : {OPENCL::kMemoryFrameBuffer, OPENCL::kMemoryImage2D}) {
    SCOPED_TRACE(kind == OPENCL::kMemoryImage2D ? "image" : "buffer");
    NLEComPtr<INLEOpenCLFrame> a, b, small;
    ASSERT_EQ(NLECommon::CreateOpenCLFrame(device_, kWidth, kHeight, kind, &a), NLE_S_OK);
    ASSERT_EQ(NLECommon::CreateOpenCLFrame(device_, kWidth, kHeight, kind, &b), NLE_S_OK);
    ASSERT_EQ(NLECommon::CreateOpenCLFrame(device_, kWidth, kHeight - 1, kind, &small), NLE_S_OK);
    std::vector<uint8_t> packed(kWidth * 4 * kHeight, 0xEE);
    ASSERT_EQ(b->Download(packed.data(), 0), NLE_S_OK);  // new frames are zeroed
    EXPECT_EQ(std::count(packed.begin(), packed.end(), 0), static_cast<long>(packed.size()));

    ASSERT_EQ(a->Upload(in.data(), kStride), NLE_S_OK);
    EXPECT_EQ(a->Upload(in.data(), kWidth * 4 - 1), NLE_E_INVALIDARG);
    auto memoryOf = [](INLEFrame* frame) {
      NLEComPtr<INLEFrameSurface> surface;
      EXPECT_EQ(frame->GetSurface(&surface), NLE_S_OK);
      return static_cast<OPENCL::openclMemory*>(surface->GetDeviceMemory());
    };
    OPENCL::openclMemory* target = memoryOf(b);
    ASSERT_TRUE(target->copyToMemory(memoryOf(a), true));
    EXPECT_FALSE(target->copyToMemory(memoryOf(small), true));
    ASSERT_EQ(b->Download(packed.data(), 0), NLE_S_OK);
    for (int y = 0; y < kHeight; ++y) {
      ASSERT_EQ(std::memcmp(&packed[y * kWidth * 4], &in[y * kStride], kWidth * 4), 0) << y;
    }

    // Without a source the memory is cleared.
    ASSERT_TRUE(target->copyToMemory(nullptr, true));
    ASSERT_EQ(b->Download(packed.data(), 0), NLE_S_OK);
    EXPECT_EQ(std::count(packed.begin(), packed.end(), 0), static_cast<long>(packed.size()));
  }
  NLEComPtr<INLEOpenCLFrame> bad;
  EXPECT_EQ(NLECommon::CreateOpenCLFrame(device_, 0, 4, OPENCL::kMemoryImage2D, &bad),
            NLE_E_INVALIDARG);
  EXPECT_EQ(NLECommon::CreateOpenCLFrame(device_, 4, 4, OPENCL::kMemoryBuffer, &bad),
            NLE_E_INVALIDARG);
  EXPECT_EQ(NLECommon::CreateOpenCLFrame(nullptr, 4, 4, OPENCL::kMemoryImage2D, &bad),
            NLE_E_INVALIDARG);
}

// The plug-in's parameter-block kind (4336) is made from its first contents, which it needs;
// kernels reading such memory are covered by the effects that upload their tables this way.
TEST_F(OpenCL, ParameterBlockMemoryNeedsItsContents) {
  int32_t block[27];
  for (int i = 0; i < 27; ++i) block[i] = i * 1000 - 5;
  OPENCL::openclMemory* params = nullptr;
  ASSERT_TRUE(memory_->createOpenCLMem(static_cast<OPENCL::MemoryType>(4336), 108, block, &params));
  const OPENCL::openclMemoryInfo info = params->getOpenCLMemoryInfo();
  EXPECT_EQ(info.width, 108);
  EXPECT_EQ(info.height, 1);
  EXPECT_EQ(info.kind, OPENCL::kMemoryBuffer);
  int32_t back[27] = {};
  ASSERT_TRUE(
      params->readDataFromOpenCLMemory(reinterpret_cast<char*>(back), 108, 0, true, nullptr));
  EXPECT_EQ(std::memcmp(back, block, 108), 0);
  EXPECT_FALSE(params->writeData2OpenCLMemory(reinterpret_cast<const char*>(block), 8, 104, true,
                                              nullptr));  // past the end

  OPENCL::openclMemory* refused = reinterpret_cast<OPENCL::openclMemory*>(1);
  EXPECT_FALSE(memory_->createOpenCLMem(OPENCL::kMemParamBlock, 108, nullptr, &refused));
  EXPECT_EQ(refused, nullptr);
  EXPECT_FALSE(
      memory_->createOpenCLMem(static_cast<OPENCL::MemoryType>(4337), 108, block, &refused));
  EXPECT_FALSE(memory_->createOpenCLMem(OPENCL::kMemBufferReadOnly, 0, block, &refused));
  memory_->releaseOpenCLMem(params);
}

TEST_F(OpenCL, DeviceIsChosenByIndexOrEnvironment) {
  const std::vector<NLEOpenCLDeviceInfo> all = OpenCLDevices();
  const int count = static_cast<int>(all.size());
  // Unset: the first GPU, else the first CPU.
  int expected = -1;
  for (uint64_t wanted : {4u, 2u}) {
    for (int i = 0; expected < 0 && i < count; ++i) {
      if (all[i].type & wanted) expected = i;
    }
  }
  if (expected < 0) expected = 0;
  EXPECT_EQ(NameOf(device_), all[expected].device);

  NLEComPtr<INLECGDevice> device;
  const std::string last = std::to_string(count - 1);
  choice_.Set(last.c_str());
  ASSERT_EQ(NLECommon::CreateOpenCLDevice(-1, &device), NLE_S_OK);
  EXPECT_EQ(NameOf(device), all[count - 1].device);
  ASSERT_EQ(NLECommon::CreateOpenCLDevice(0, &device), NLE_S_OK);  // an index beats the variable
  EXPECT_EQ(NameOf(device), all[0].device);

  const std::string past = std::to_string(count);
  for (const char* bad : {past.c_str(), "-1", "0x", "gpu"}) {
    SCOPED_TRACE(bad);
    choice_.Set(bad);
    EXPECT_EQ(NLECommon::CreateOpenCLDevice(-1, &device), NLE_E_INVALIDARG);
    EXPECT_EQ(device.get(), nullptr);
  }
  EXPECT_EQ(NLECommon::CreateOpenCLDevice(count, &device), NLE_E_INVALIDARG);
  EXPECT_EQ(NLECommon::CreateOpenCLDevice(-2, &device), NLE_E_INVALIDARG);

  uint32_t seen = 0;
  NLEOpenCLDeviceInfo one{};
  EXPECT_EQ(NLECommon::ListOpenCLDevices(&one, 1, &seen), NLE_S_OK);
  EXPECT_EQ(seen, all.size());
  EXPECT_STREQ(one.platform, all[0].platform);
  EXPECT_EQ(NLECommon::ListOpenCLDevices(&one, 1, nullptr), NLE_E_POINTER);
}

}  // namespace
