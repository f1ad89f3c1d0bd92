#include <gtest/gtest.h>

#include <array>
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

// That a built program serves later filters without its source is the cross-filter tests'
// business; here, what a manager refuses and what it logs.
TEST_F(OpenCL, ProgramsAreNamedPerDeviceAndLogTheirErrors) {
  const std::string dir = testing::TempDir();
  const std::string file = dir + "/tfx_copy.cl";
  std::ofstream(file) << kFillSource;
  OPENCL::openclProgram* program = programs_->createOpenCLProgram("tfx_copy");
  ASSERT_NE(program, nullptr);
  EXPECT_EQ(program->getopenclKernel("copy_words"), nullptr);  // not built yet
  ASSERT_TRUE(program->loadProgram(dir.c_str(), nullptr, nullptr, 0));
  EXPECT_EQ(programs_->getOpenCLProgram("tfx_copy"), program);
  EXPECT_EQ(programs_->createOpenCLProgram("tfx_copy"), nullptr);
  std::remove(file.c_str());

  // Another device's manager has none of them, and names the file it cannot find.
  NLEComPtr<INLECGDevice> other;
  ASSERT_EQ(NLECommon::CreateOpenCLDevice(-1, &other), NLE_S_OK);
  OPENCL::openclProgramManager* fresh = nullptr;
  OPENCL::openclMemManager* otherMemory = nullptr;
  ASSERT_NO_FATAL_FAILURE(tfx_test::OpenCLHandles(other, &fresh, &otherMemory));
  EXPECT_EQ(fresh->getOpenCLProgram("tfx_copy"), nullptr);
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

// Kernels check their arguments; frames of both kinds start zeroed, take a kernel's output over
// every pixel, go up and down with a stride that leaves the padding alone, copy and clear.
TEST_F(OpenCL, KernelsAndFramesOfBothKinds) {
  OPENCL::openclProgram* program = FillProgram();
  ASSERT_NE(program, nullptr);
  OPENCL::openclKernel* copy = program->getopenclKernel("copy_words");
  ASSERT_NE(copy, nullptr);
  EXPECT_EQ(program->getopenclKernel("no_such_kernel"), nullptr);
  OPENCL::openclMemory* none = nullptr;
  EXPECT_FALSE(copy->setKernelParameters(0, OPENCL::kDataMemory, &none, 8));
  EXPECT_FALSE(copy->setKernelParameters(0, OPENCL::kDataMemory, nullptr, 8));
  EXPECT_FALSE(copy->setKernelParameters(7, OPENCL::kDataScalar, &none, 8));  // no argument 7
  EXPECT_FALSE(copy->setKernelParameters(0, static_cast<OPENCL::DataType>(3), &none, 8));
  EXPECT_FALSE(copy->runKernel(0, 1, 1, true));

  constexpr int kWidth = 37, kHeight = 5, kStride = kWidth * 4 + 8;
  using Pixel = std::array<uint8_t, 4>;
  const tfx_test::Bytes in = tfx_test::NoiseBytes(kStride * kHeight, 3);
  const auto expectDownload = [&](INLEOpenCLFrame* frame, auto pixel) {
    std::vector<uint8_t> out(kStride * kHeight, 0xEE);
    ASSERT_EQ(frame->Download(out.data(), kStride), NLE_S_OK);
    for (int y = 0; y < kHeight; ++y) {
      for (int x = 0; x < kWidth; ++x) {
        const Pixel expected = pixel(x, y);
        ASSERT_EQ(std::memcmp(&out[y * kStride + x * 4], expected.data(), 4), 0) << x << "," << y;
      }
      for (int i = kWidth * 4; i < kStride; ++i) ASSERT_EQ(out[y * kStride + i], 0xEE);
    }
  };
  const auto zero = [](int, int) { return Pixel{}; };
  for (OPENCL::MemoryKind kind : {OPENCL::kMemoryFrameBuffer, OPENCL::kMemoryImage2D}) {
    SCOPED_TRACE(kind == OPENCL::kMemoryImage2D ? "image" : "buffer");
    NLEComPtr<INLEOpenCLFrame> a, b, small;
    ASSERT_EQ(NLECommon::CreateOpenCLFrame(device_, kWidth, kHeight, kind, &a), NLE_S_OK);
    ASSERT_EQ(NLECommon::CreateOpenCLFrame(device_, kWidth, kHeight, kind, &b), NLE_S_OK);
    ASSERT_EQ(NLECommon::CreateOpenCLFrame(device_, kWidth, kHeight - 1, kind, &small), NLE_S_OK);
    NLEFrameDesc desc{};
    ASSERT_EQ(a->GetDescription(&desc, true, false), NLE_S_OK);
    EXPECT_EQ(desc.storage, kNLEFrameStorageSurface);
    uint8_t* pixels = nullptr;
    EXPECT_EQ(a->GetPixels(&pixels), NLE_E_NOTIMPL);
    expectDownload(a, zero);

    const auto memoryOf = [](INLEFrame* frame) {
      NLEComPtr<INLEFrameSurface> surface;
      EXPECT_EQ(frame->GetSurface(&surface), NLE_S_OK);
      EXPECT_EQ(surface->GetKind(), kNLESurfaceOpenCL);
      EXPECT_EQ(frame->ReleaseSurface(surface), NLE_S_OK);
      return static_cast<OPENCL::openclMemory*>(surface->GetDeviceMemory());
    };
    OPENCL::openclMemory* memory = memoryOf(a);
    ASSERT_NE(memory, nullptr);
    EXPECT_EQ(memory->getOpenCLMemoryInfo().rowPitch, size_t{kWidth} * 4);
    float k = 200.0f;
    int width = kWidth;
    const bool image = kind == OPENCL::kMemoryImage2D;
    OPENCL::openclKernel* kernel = program->getopenclKernel(image ? "fill_image" : "fill_buffer");
    ASSERT_NE(kernel, nullptr);
    ASSERT_TRUE(kernel->setKernelParameters(0, OPENCL::kDataMemory, &memory, 8));
    if (!image) {
      ASSERT_TRUE(kernel->setKernelParameters(1, OPENCL::kDataScalar, &width, 4));
    }
    ASSERT_TRUE(kernel->setKernelParameters(image ? 1 : 2, OPENCL::kDataScalar, &k, 4));
    ASSERT_TRUE(kernel->runKernel(kWidth, kHeight, 1, true));
    expectDownload(a, [](int x, int y) { return Pixel{200, uint8_t(y), uint8_t(x), 255}; });

    ASSERT_EQ(b->Upload(in.data(), kStride), NLE_S_OK);
    EXPECT_EQ(b->Upload(in.data(), kWidth * 4 - 1), NLE_E_INVALIDARG);
    ASSERT_TRUE(memory->copyToMemory(memoryOf(b), true));
    EXPECT_FALSE(memory->copyToMemory(memoryOf(small), true));
    expectDownload(a, [&](int x, int y) {
      Pixel p;
      std::memcpy(p.data(), &in[y * kStride + x * 4], 4);
      return p;
    });
    ASSERT_TRUE(memory->copyToMemory(nullptr, true));  // without a source: cleared
    expectDownload(a, zero);
  }
  NLEComPtr<INLEOpenCLFrame> bad;
  EXPECT_EQ(NLECommon::CreateOpenCLFrame(device_, 0, 4, OPENCL::kMemoryImage2D, &bad),
            NLE_E_INVALIDARG);
  EXPECT_EQ(NLECommon::CreateOpenCLFrame(device_, 4, 4, OPENCL::kMemoryBuffer, &bad),
            NLE_E_INVALIDARG);
  EXPECT_EQ(NLECommon::CreateOpenCLFrame(nullptr, 4, 4, OPENCL::kMemoryImage2D, &bad),
            NLE_E_INVALIDARG);
}

// The plug-in's parameter-block kind (4336) is made from its first contents, which it needs; the
// cross-filter tests read such a block back.
TEST_F(OpenCL, ParameterBlockMemoryNeedsItsContents) {
  int32_t block[27] = {};
  OPENCL::openclMemory* params = nullptr;
  ASSERT_TRUE(memory_->createOpenCLMem(static_cast<OPENCL::MemoryType>(4336), 108, block, &params));
  EXPECT_FALSE(params->writeData2OpenCLMemory(reinterpret_cast<const char*>(block), 8, 104, true,
                                              nullptr));  // past the end
  memory_->releaseOpenCLMem(params);

  OPENCL::openclMemory* refused = reinterpret_cast<OPENCL::openclMemory*>(1);
  EXPECT_FALSE(memory_->createOpenCLMem(OPENCL::kMemParamBlock, 108, nullptr, &refused));
  EXPECT_EQ(refused, nullptr);
  EXPECT_FALSE(
      memory_->createOpenCLMem(static_cast<OPENCL::MemoryType>(4337), 108, block, &refused));
  EXPECT_FALSE(memory_->createOpenCLMem(OPENCL::kMemBufferReadOnly, 0, block, &refused));
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
