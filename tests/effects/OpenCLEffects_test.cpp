// The OpenCL classes against their CPU twins on the same frames, and the "LUT" kernel against
// the plain tetrahedral formula over every 8-bit colour.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <memory>
#include <random>
#include <string>
#include <thread>

#include "lut/CubeLutApply.h"
#include "media/DemoScene.h"
#include "support/EffectHarness.h"
#include "support/ImageBuilders.h"
#include "support/OpenCLHarness.h"
#include "support/TempDir.h"
#include "tessarofx/CubeLut.h"

namespace {

using tfx_test::Bytes;
using tfx_test::CompareBytes;
namespace Key = NLEKey::Filter;
using tfx_test::kChromeKey;
using tfx_test::kLut;
using tfx_test::kWhiteBalance;

Bytes RandomPixels(int width, int height, unsigned salt) {
  return tfx_test::NoiseBytes(size_t(width) * height * 4, salt);
}

Bytes DemoPixels() {
  const cv::Mat scene = tfxtool::MakeDemoScene(960, 540);
  return Bytes(scene.data, scene.data + scene.total() * scene.elemSize());
}

class OpenCLEffects : public tfx_test::OpenCLEffectTest {};

TEST_F(OpenCLEffects, WhiteBalanceFollowsTheCpuClassWithinALevel) {
  const Bytes pixels = RandomPixels(256, 64, 2);
  size_t differing = 0;
  for (double temperature : {-100.0, -37.0, 0.0, 13.0, 100.0}) {
    for (double tint : {-100.0, -51.0, 0.0, 77.0, 100.0}) {
      // Gains are accepted and, on both paths, left out.
      NLEComPtr<INLEProperties> settings = tfx_test::Settings(
          {{L"u_temperature", temperature}, {L"u_tint", tint}, {L"u_rgain", 3.0}});
      NLEComPtr<INLECGFilter> cpu = tfx_test::CreateEffect(kWhiteBalance, settings.get());
      NLEComPtr<INLECGFilter> gpu = CreateOnDevice(kWhiteBalance, settings.get());
      const Bytes expected = RunOnCpu(cpu.get(), pixels, 256, 64);
      const tfx_test::ByteDiff d = CompareBytes(RunOnDevice(gpu.get(), pixels, 256, 64), expected);
      EXPECT_LE(d.largest, 1) << temperature << " " << tint;
      differing += d.count;
      if (temperature == 0 && tint == 0) {
        EXPECT_EQ(expected, pixels);
      }
    }
  }
  // The factors are derived in two precisions; they rarely land on different sides of a level.
  EXPECT_LT(differing, pixels.size() / 100);
}

// A lattice of N points whose values reach every branch of the byte rounding: below -0.5 (wraps),
// above 255, exact halves, NaN, infinities and values outside 32 bits.
void FillHostileLattice(CubeLut* lut, int n, unsigned salt) {
  lut->generateLUT3DData(n);
  std::mt19937 rng(salt);
  std::uniform_real_distribution<float> value(-300.0f, 600.0f);
  const float inf = std::numeric_limits<float>::infinity();
  const float specials[] = {std::nanf(""), inf,   -inf,  -2147483648.0f, -2147483904.0f, 3e9f,
                            254.5f,        -0.5f, -1.5f, 0.49999997f,    -300.5f};
  for (int i = 0; i < n; ++i) {
    for (int j = 0; j < n; ++j) {
      for (int k = 0; k < n; ++k) {
        float* p = tfx_test::LatticePoint(*lut, i, j, k);
        for (int c = 0; c < 3; ++c) {
          const uint32_t pick = rng() % 64;
          p[c] = pick < std::size(specials) ? specials[pick]
                 : pick < 40                ? std::round(value(rng) * 2.0f) / 2.0f
                                            : value(rng);
        }
      }
    }
  }
}

TEST_F(OpenCLEffects, LutKernelIsTheTetrahedralFormulaToTheByte) {
  OPENCL::openclProgramManager* manager = nullptr;
  OPENCL::openclMemManager* memory = nullptr;
  ASSERT_NO_FATAL_FAILURE(Handles(&manager, &memory));
  OPENCL::openclProgram* program = manager->createOpenCLProgram("LUT");
  ASSERT_TRUE(program && program->loadProgram(TFX_KERNEL_DIR, nullptr, nullptr, 0));
  OPENCL::openclKernel* kernel = program->getopenclKernel("MAIN");
  ASSERT_NE(kernel, nullptr);

  const CxImage& colours = tfx_test::EveryColour();
  const Bytes every(colours.GetBits(), colours.GetBits() + colours.GetSize());
  const Bytes sample(every.begin(), every.begin() + (size_t{1} << 22));  // a quarter of the reds
  struct Case {
    int n;
    const Bytes* pixels;
  };
  for (const Case& c : {Case{64, &every}, Case{2, &sample}, Case{17, &sample}, Case{33, &sample},
                        Case{52, &sample}}) {
    const auto lutOwned = std::make_unique<CubeLut>();  // about 3 MiB: never on the stack
    CubeLut& lut = *lutOwned;
    FillHostileLattice(&lut, c.n, static_cast<unsigned>(c.n));
    const int width = 4096, height = static_cast<int>(c.pixels->size() / 4 / 4096);
    Bytes expected = *c.pixels;
    const tfx::TetraTable table{lut.getLut3DData(nullptr, nullptr, nullptr, nullptr),
                                lut.getFTData(nullptr), lut.getGTData(nullptr), c.n};
    tfx::TetraRowReference(table, expected.data(), width * height, 4);

    OPENCL::openclMemory *src = nullptr, *dst = nullptr, *lattice = nullptr, *ft = nullptr,
                         *gt = nullptr;
    ASSERT_TRUE(memory->createOpenCLFrameMem(width, height, OPENCL::kMemoryFrameBuffer,
                                             c.pixels->data(), 0, &src));
    ASSERT_TRUE(
        memory->createOpenCLFrameMem(width, height, OPENCL::kMemoryFrameBuffer, nullptr, 0, &dst));
    ASSERT_TRUE(memory->createOpenCLMem(OPENCL::kMemBufferReadOnly, 64 * 64 * 64 * 3 * 4,
                                        table.lattice, &lattice));
    ASSERT_TRUE(memory->createOpenCLMem(OPENCL::kMemBufferReadOnly, 1024, table.ft, &ft));
    ASSERT_TRUE(memory->createOpenCLMem(OPENCL::kMemBufferReadOnly, 1024, table.gt, &gt));
    int32_t axis = 64, point = 3, n = c.n;
    OPENCL::openclMemory* args[] = {src, dst, lattice, ft, gt};
    for (int i = 0; i < 5; ++i) {
      ASSERT_TRUE(kernel->setKernelParameters(i, OPENCL::kDataMemory, &args[i], 8));
    }
    ASSERT_TRUE(kernel->setKernelParameters(5, OPENCL::kDataScalar, &axis, 4));
    ASSERT_TRUE(kernel->setKernelParameters(6, OPENCL::kDataScalar, &point, 4));
    ASSERT_TRUE(kernel->setKernelParameters(7, OPENCL::kDataScalar, &n, 4));
    ASSERT_TRUE(program->runProgramKernel(kernel, width, height, 0, 0, true));
    Bytes got(expected.size());
    ASSERT_TRUE(dst->readDataFromOpenCLMemory(reinterpret_cast<char*>(got.data()), got.size(), 0,
                                              true, nullptr));
    const tfx_test::ByteDiff d = CompareBytes(got, expected);
    EXPECT_EQ(d.count, 0u) << "N = " << c.n << ", largest difference " << d.largest;
    for (OPENCL::openclMemory* m : args) memory->releaseOpenCLMem(m);
  }
}

class OpenCLLutFiles : public OpenCLEffects {
 protected:
  std::wstring Write(const std::string& name, const std::string& text) {
    return tfx_test::Wide(dir_.Write(name, text));
  }

  tfx_test::TempDir dir_;
};

TEST_F(OpenCLLutFiles, LutMatchesTheCpuClassPassesUnreadableFilesThroughAndFollowsThePath) {
  const Bytes scene = DemoPixels();
  const Bytes noise = RandomPixels(640, 360, 3);
  for (int size : {17, 33, 64}) {
    NLEComPtr<INLEProperties> settings =
        tfx_test::TextSettings(L"lut3dPath", Write("grade.cube", tfxtool::MakeDemoLut(size)));
    NLEComPtr<INLECGFilter> cpu = tfx_test::CreateEffect(kLut, settings.get());
    NLEComPtr<INLECGFilter> gpu = CreateOnDevice(kLut, settings.get());
    EXPECT_EQ(RunOnDevice(gpu.get(), scene, 960, 540), RunOnCpu(cpu.get(), scene, 960, 540))
        << size;
    EXPECT_EQ(RunOnDevice(gpu.get(), noise, 640, 360), RunOnCpu(cpu.get(), noise, 640, 360))
        << size;
  }

  // A file that cannot be read, or one of 65 points, leaves a copy; an empty path is an error
  // that leaves the destination as it was.
  Write("big.cube", "LUT_3D_SIZE 65\n");
  for (const std::wstring& path :
       {Write("grade.txt", tfxtool::MakeDemoLut(9)), std::wstring(L"/nonexistent/x.cube"),
        Write("big.cube", "LUT_3D_SIZE 65\n0 0 0\n")}) {
    NLEComPtr<INLECGFilter> gpu =
        CreateOnDevice(kLut, tfx_test::TextSettings(L"lut3dPath", path).get());
    EXPECT_EQ(RunOnDevice(gpu.get(), noise, 640, 360), noise);
  }
  NLEComPtr<INLECGFilter> empty =
      CreateOnDevice(kLut, tfx_test::TextSettings(L"lut3dPath", L"").get());
  HRESULT status = 0;
  EXPECT_EQ(RunOnDevice(empty.get(), noise, 640, 360, &status, 0xEE), Bytes(noise.size(), 0xEE));
  EXPECT_EQ(status, NLE_E_RESOURCE);

  // The path is followed from frame to frame.
  const std::wstring warm = Write("warm.cube", tfxtool::MakeDemoLut(9));
  const std::wstring flat = Write("flat.cube", tfx_test::CubeText(2, "", 0, 0.5));
  NLEComPtr<INLECGFilter> gpu =
      CreateOnDevice(kLut, tfx_test::TextSettings(L"lut3dPath", warm).get());
  NLEComPtr<INLECGFilter> cpu =
      tfx_test::CreateEffect(kLut, tfx_test::TextSettings(L"lut3dPath", warm).get());
  EXPECT_EQ(RunOnDevice(gpu.get(), noise, 640, 360), RunOnCpu(cpu.get(), noise, 640, 360));

  NLEComPtr<INLEProperties> param;
  ASSERT_EQ(gpu->GetParamPropertyFromName(L"lut3dPath", &param), NLE_S_OK);
  param->SetString(Key::Property::kValue_Current, flat.c_str());
  gpu->ParamValueChanged();
  // The new table applies from the next frame: mid-grey everywhere, alpha kept.
  NLEComPtr<INLECGFilter> cpuFlat =
      tfx_test::CreateEffect(kLut, tfx_test::TextSettings(L"lut3dPath", flat).get());
  const Bytes grey = RunOnDevice(gpu.get(), noise, 640, 360);
  EXPECT_EQ(grey, RunOnCpu(cpuFlat.get(), noise, 640, 360));
  for (size_t i = 0; i < grey.size(); ++i) {
    ASSERT_TRUE(i % 4 == 3 ? grey[i] == noise[i] : grey[i] == 127 || grey[i] == 128) << i;
  }
}

TEST_F(OpenCLEffects, ChromeKeyMatchesTheCpuClassInBothModes) {
  const Bytes scene = DemoPixels();
  const tfxtool::Rgb screen = tfxtool::DemoScreenColour();
  NLEComPtr<INLEProperties> settings = tfx_test::Settings({{L"red", screen.r},
                                                           {L"green", screen.g},
                                                           {L"blue", screen.b},
                                                           {L"contrast", 50.0},
                                                           {L"offset", 0.0},
                                                           {L"mode", 0}});
  NLEComPtr<INLECGFilter> cpu = tfx_test::CreateEffect(kChromeKey, settings.get());
  NLEComPtr<INLECGFilter> gpu = CreateOnDevice(kChromeKey, settings.get());
  const auto expectSame = [&](const char* what) {
    const Bytes expected = RunOnCpu(cpu.get(), scene, 960, 540);
    const tfx_test::ByteDiff d = CompareBytes(RunOnDevice(gpu.get(), scene, 960, 540), expected);
    EXPECT_EQ(d.count, 0u) << what << ": largest difference " << d.largest;
    return expected;
  };
  const Bytes mask = expectSame("mask");
  for (INLECGFilter* f : {cpu.get(), gpu.get()}) tfx_test::SetParam(f, L"mode", 1);
  const Bytes beauty = expectSame("colours");
  EXPECT_NE(mask, beauty);
  for (INLECGFilter* f : {cpu.get(), gpu.get()}) tfx_test::SetParam(f, L"contrast", 80.0);
  expectSame("colours after a contrast change");
  for (INLECGFilter* f : {cpu.get(), gpu.get()}) tfx_test::SetParam(f, L"mode", 0);
  expectSame("mask after a contrast change");

  // Another mode keeps the table the device applied last; the CPU class copies instead.
  tfx_test::SetParam(gpu.get(), L"mode", 2);
  tfx_test::SetParam(gpu.get(), L"blue", screen.b + 40);  // rebuilt tables, still the mask
  for (INLECGFilter* f : {cpu.get()}) tfx_test::SetParam(f, L"blue", screen.b + 40);
  EXPECT_EQ(RunOnDevice(gpu.get(), scene, 960, 540), RunOnCpu(cpu.get(), scene, 960, 540));
  // ... and a filter that never had a table has nothing to run.
  NLEComPtr<INLECGFilter> fresh =
      CreateOnDevice(kChromeKey, tfx_test::Settings({{L"green", 255}, {L"mode", 2}}).get());
  HRESULT status = 0;
  RunOnDevice(fresh.get(), scene, 960, 540, &status);
  EXPECT_EQ(status, NLE_E_RESOURCE);
}

// Render threads with a device each run at once and give what one thread gives.
TEST_F(OpenCLEffects, FiltersOnTwoDevicesRunOnTwoThreads) {
  const Bytes scene = DemoPixels();
  const tfxtool::Rgb screen = tfxtool::DemoScreenColour();
  NLEComPtr<INLEProperties> key = tfx_test::Settings(
      {{L"red", screen.r}, {L"green", screen.g}, {L"blue", screen.b}, {L"mode", 1}});
  NLEComPtr<INLEProperties> warm = tfx_test::Settings({{L"u_temperature", 60.0}});
  NLEComPtr<INLECGFilter> cpuKey = tfx_test::CreateEffect(kChromeKey, key.get());
  NLEComPtr<INLECGFilter> cpuWarm = tfx_test::CreateEffect(kWhiteBalance, warm.get());
  const Bytes keyed = RunOnCpu(cpuKey.get(), scene, 960, 540);
  const Bytes warmed = RunOnCpu(cpuWarm.get(), scene, 960, 540);

  struct Worker {
    NLEComPtr<INLECGDevice> device;
    NLEComPtr<INLECGFilter> filter;
    NLEComPtr<INLEOpenCLFrame> in, out;
    Bytes result;
  };
  Worker workers[2];
  INLEProperties* settings[2] = {key.get(), warm.get()};
  const wchar_t* guids[2] = {kChromeKey, kWhiteBalance};
  for (int i = 0; i < 2; ++i) {
    Worker& w = workers[i];
    ASSERT_EQ(NLECommon::CreateOpenCLDevice(-1, &w.device), NLE_S_OK);
    ASSERT_EQ(CreateFilterFromGUID(w.device.get(), guids[i], settings[i], TFX_KERNEL_DIR,
                                   reinterpret_cast<void**>(&w.filter)),
              NLE_S_OK);
    ASSERT_EQ(
        NLECommon::CreateOpenCLFrame(w.device.get(), 960, 540, OPENCL::kMemoryFrameBuffer, &w.in),
        NLE_S_OK);
    ASSERT_EQ(
        NLECommon::CreateOpenCLFrame(w.device.get(), 960, 540, OPENCL::kMemoryFrameBuffer, &w.out),
        NLE_S_OK);
  }
  std::thread threads[2];
  for (int i = 0; i < 2; ++i) {
    threads[i] = std::thread([&w = workers[i], &scene] {
      for (int frame = 0; frame < 4; ++frame) {
        w.in->Upload(scene.data(), 0);
        w.filter->SetForeground(w.in.get());
        if (w.filter->Running(w.out.get()) != NLE_S_OK) return;
        w.result.assign(scene.size(), 0);
        w.out->Download(w.result.data(), 0);
      }
    });
  }
  for (std::thread& t : threads) t.join();
  EXPECT_EQ(workers[0].result, keyed);
  EXPECT_LE(CompareBytes(workers[1].result, warmed).largest, 1);
}

}  // namespace
