// Agreement with OpenColorIO: a look baked by OCIO into a 33-point ".CUBE" file, read by
// CubeLut::loadFile and applied by doLUT, against OCIO applying the same file with tetrahedral
// interpolation at 8 bits. The two differ only in float rounding, so every channel of every
// colour must agree within one level.
#include <OpenColorIO/OpenColorIO.h>
#include <gtest/gtest.h>

#include <array>
#include <memory>
#include <opencv2/core.hpp>
#include <sstream>
#include <string>

#include "support/ImageBuilders.h"
#include "support/TempDir.h"
#include "tessarofx/CubeLut.h"

namespace OCIO = OCIO_NAMESPACE;

namespace {

// A plain input space and a graded one: an ASC CDL (clamped to 0..1, so neither side sees values
// beyond the byte range) with saturation, then a channel-mixing matrix that keeps 0..1 inside.
OCIO::ConstConfigRcPtr GradeConfig() {
  OCIO::ConfigRcPtr config = OCIO::Config::Create();
  // Not the raw config's own space: that one is data, which OCIO never converts.
  OCIO::ColorSpaceRcPtr plain = OCIO::ColorSpace::Create();
  plain->setName("plain");
  config->addColorSpace(plain);
  OCIO::CDLTransformRcPtr cdl = OCIO::CDLTransform::Create();
  cdl->setStyle(OCIO::CDL_ASC);
  cdl->setSlope(std::array<double, 3>{1.15, 0.95, 0.85}.data());
  cdl->setOffset(std::array<double, 3>{-0.02, 0.01, 0.05}.data());
  cdl->setPower(std::array<double, 3>{0.8, 1.1, 1.3}.data());
  cdl->setSat(1.25);
  OCIO::MatrixTransformRcPtr matrix = OCIO::MatrixTransform::Create();
  const double m44[16] = {0.8, 0.15, 0.05, 0, 0.1, 0.85, 0.05, 0, 0.0, 0.2, 0.8, 0, 0, 0, 0, 1};
  matrix->setMatrix(m44);
  OCIO::GroupTransformRcPtr grade = OCIO::GroupTransform::Create();
  grade->appendTransform(cdl);
  grade->appendTransform(matrix);
  OCIO::ColorSpaceRcPtr graded = OCIO::ColorSpace::Create();
  graded->setName("graded");
  graded->setTransform(grade, OCIO::COLORSPACE_DIR_FROM_REFERENCE);
  config->addColorSpace(graded);
  return config;
}

// OCIO's "resolve_cube" writes a 1-D shaper section as well, which the reader refuses as an
// unknown keyword; "iridas_cube" is a plain 3-D table.
TEST(CubeLutOcio, BakedLookAgreesWithinOneLevel) {
  try {
    const OCIO::ConstConfigRcPtr config = GradeConfig();
    OCIO::BakerRcPtr baker = OCIO::Baker::Create();
    baker->setConfig(config);
    baker->setFormat("iridas_cube");
    baker->setInputSpace("plain");
    baker->setTargetSpace("graded");
    baker->setCubeSize(33);
    std::ostringstream baked;
    baker->bake(baked);

    const tfx_test::TempDir dir;
    const std::string path = dir.Write("look.cube", baked.str());
    auto lut = std::make_unique<CubeLut>();
    ASSERT_TRUE(lut->loadFile(tfx_test::Wide(path).c_str()))
        << "status " << lut->getStatus() << "; the file begins:\n"
        << baked.str().substr(0, 300);
    ASSERT_EQ(33, lut->getLutSize());

    OCIO::FileTransformRcPtr transform = OCIO::FileTransform::Create();
    transform->setSrc(path.c_str());
    transform->setInterpolation(OCIO::INTERP_TETRAHEDRAL);
    transform->setDirection(OCIO::TRANSFORM_DIR_FORWARD);
    const OCIO::ConstCPUProcessorRcPtr cpu =
        config->getProcessor(transform)->getOptimizedCPUProcessor(
            OCIO::BIT_DEPTH_UINT8, OCIO::BIT_DEPTH_UINT8, OCIO::OPTIMIZATION_NONE);

    const CxImage& colours = tfx_test::EveryColour();
    const tfx_test::Image ours = tfx_test::Clone(colours), theirs = tfx_test::Clone(colours);
    const int width = static_cast<int>(colours.GetWidth());
    const int height = static_cast<int>(colours.GetHeight());
    const int pitch = static_cast<int>(colours.GetEffWidth());
    ASSERT_EQ(0, lut->doLUT(ours->GetBits(), width, height, pitch, 4));
    OCIO::PackedImageDesc desc(theirs->GetBits(), width, height, OCIO::CHANNEL_ORDERING_BGRA,
                               OCIO::BIT_DEPTH_UINT8, 1, 4, pitch);
    cpu->apply(desc);

    const auto mat = [&](const CxImage& image) {
      return cv::Mat(height, width, CV_8UC4, image.GetBits(), static_cast<size_t>(pitch));
    };
    cv::Mat differences, changes;  // alpha is left alone by both
    cv::absdiff(mat(*ours), mat(*theirs), differences);
    cv::absdiff(mat(*ours), mat(colours), changes);
    EXPECT_LE(cv::norm(differences, cv::NORM_INF), 1);
    // A look that changed nothing would agree trivially; a systematic offset would not leave
    // nearly every channel exact.
    const int channels = width * height * 3;
    EXPECT_GT(cv::countNonZero(changes.reshape(1)), channels / 2);
    const int differing = cv::countNonZero(differences.reshape(1));
    EXPECT_LT(differing, channels / 1000) << differing << " channels differ by one level";
  } catch (const OCIO::Exception& e) {
    FAIL() << "OpenColorIO: " << e.what();
  }
}

}  // namespace
