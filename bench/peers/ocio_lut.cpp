// OpenColorIO's CPU processor applying a ".cube" file with tetrahedral interpolation to 8-bit
// packed BGRA frames, in place, on one thread: the peer of CubeLut::doLUT in
// scripts/bench-peers.sh. The frame is the one bench_cube_lut times (bytes of std::mt19937 seeded
// with 7), and --write-frame saves it for the other peers.
//   ocio_lut CUBE WIDTH HEIGHT [SECONDS]    prints Mpixel/s
//   ocio_lut --write-frame FILE WIDTH HEIGHT
#include <OpenColorIO/OpenColorIO.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <exception>
#include <random>
#include <string>
#include <vector>

namespace OCIO = OCIO_NAMESPACE;

namespace {

std::vector<uint8_t> RandomFrame(int width, int height) {
  std::vector<uint8_t> px(static_cast<size_t>(width) * height * 4);
  std::mt19937 rng(7);
  for (auto& b : px) b = static_cast<uint8_t>(rng());
  return px;
}

int Usage() {
  std::fprintf(stderr,
               "usage: ocio_lut CUBE WIDTH HEIGHT [SECONDS]\n"
               "       ocio_lut --write-frame FILE WIDTH HEIGHT\n");
  return 2;
}

}  // namespace

int main(int argc, char** argv) {
  const bool write = argc > 1 && std::strcmp(argv[1], "--write-frame") == 0;
  if (argc < 4 + write) return Usage();
  const int width = std::atoi(argv[2 + write]), height = std::atoi(argv[3 + write]);
  if (width < 1 || height < 1) return Usage();
  std::vector<uint8_t> frame = RandomFrame(width, height);
  if (write) {
    FILE* out = std::fopen(argv[2], "wb");
    if (!out || std::fwrite(frame.data(), 1, frame.size(), out) != frame.size()) return 1;
    return std::fclose(out) == 0 ? 0 : 1;
  }
  const double seconds = argc > 4 ? std::atof(argv[4]) : 2.0;
  if (!(seconds > 0.0)) return Usage();
  try {
    OCIO::ConstConfigRcPtr config = OCIO::Config::CreateRaw();
    OCIO::FileTransformRcPtr file = OCIO::FileTransform::Create();
    file->setSrc(argv[1]);
    file->setInterpolation(OCIO::INTERP_TETRAHEDRAL);
    OCIO::ConstProcessorRcPtr processor = config->getProcessor(file);
    OCIO::ConstCPUProcessorRcPtr cpu = processor->getOptimizedCPUProcessor(
        OCIO::BIT_DEPTH_UINT8, OCIO::BIT_DEPTH_UINT8, OCIO::OPTIMIZATION_DEFAULT);
    OCIO::PackedImageDesc image(frame.data(), width, height, OCIO::CHANNEL_ORDERING_BGRA,
                                OCIO::BIT_DEPTH_UINT8, 1, 4, static_cast<ptrdiff_t>(width) * 4);
    const std::vector<uint8_t> source = frame;
    cpu->apply(image);  // warm-up
    // CPU time, as the script takes it from every program; the processor runs on this thread.
    const auto now = [] {
      timespec t{};
      clock_gettime(CLOCK_THREAD_CPUTIME_ID, &t);
      return static_cast<double>(t.tv_sec) + static_cast<double>(t.tv_nsec) * 1e-9;
    };
    double timed = 0.0;
    long frames = 0;
    while (timed < seconds) {
      std::memcpy(frame.data(), source.data(), frame.size());  // not timed
      const double t0 = now();
      cpu->apply(image);
      timed += now() - t0;
      ++frames;
    }
    std::printf("%.1f\n", static_cast<double>(frames) * width * height / timed / 1e6);
  } catch (const std::exception& e) {
    std::fprintf(stderr, "ocio_lut: %s\n", e.what());
    return 1;
  }
  return 0;
}
