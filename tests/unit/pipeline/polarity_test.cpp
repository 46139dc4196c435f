// Default backgrounds, the two inversion rules and the lane-detection image.
#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <vector>

#include <opencv2/core.hpp>

#include "image/polarity.h"
#include "viraduve/Exception.h"

namespace viraduve {
namespace {

using ImageProcessing::computeImageForLaneDetection;
using ImageProcessing::setRawImageDefaultBackground;

std::vector<ImageParam> paramsOf(std::vector<ChannelType> types, std::vector<int> inverted = {}) {
  std::vector<ImageParam> params(types.size());
  for (std::size_t i = 0; i < types.size(); ++i) {
    params[i].channelType = types[i];
    params[i].backgroundInverted = i < inverted.size() ? inverted[i] : 0;
  }
  return params;
}

TEST(DefaultBackground, PerMode) {
  const struct {
    ImageMode mode;
    std::vector<ChannelType> types;
    bool visIsBright;
    std::vector<int> expected;
  } cases[] = {
      {ImageMode_Chemi, {ChType_Chemi, ChType_Chemi, ChType_Chemi}, false, {1, -1, -1}},
      {ImageMode_Fluo, {ChType_Fluo, ChType_Fluo}, false, {1, -1}},
      {ImageMode_Vis, {ChType_Vis, ChType_Vis}, false, {1}},
      {ImageMode_UV_WHITE, {ChType_NA}, false, {1}},
      {ImageMode_UV, {ChType_NA, ChType_NA}, false, {-1}},
      {ImageMode_Protein, {ChType_Protein}, false, {-1}},
      {ImageMode_Universal,
       {ChType_Live, ChType_Membrane, ChType_Vis, ChType_Protein, ChType_Chemi, ChType_Fluo},
       false,
       {1, 1, -1, -1, -1, -1}},
      {ImageMode_Universal, {ChType_Vis, ChType_NA}, true, {1, -1}},
      {ImageMode_Universal, {}, false, {0}},
      {ImageMOde_Other, {ChType_Chemi, ChType_Chemi}, false, {0}},
  };
  for (const auto& c : cases) {
    std::vector<int> out{7, 7, 7, 7, 7, 7, 7, 7};  // cleared first
    setRawImageDefaultBackground(c.mode, paramsOf(c.types), out, c.visIsBright);
    EXPECT_EQ(out, c.expected) << imageModeName(c.mode);
  }
}

TEST(DefaultBackground, MultiChannelModesNeedTwoChannels) {
  for (ImageMode mode : {ImageMode_Chemi, ImageMode_Fluo}) {
    std::vector<int> out;
    try {
      setRawImageDefaultBackground(mode, paramsOf({ChType_Chemi}), out, false);
      ADD_FAILURE() << "no exception";
    } catch (const Exception& e) {
      EXPECT_EQ(e.code, -4);
      EXPECT_EQ(e.message, "ERROR in setRawImageDefaultBackground! This mode needs at least 2 channels");
      EXPECT_EQ(e.function, "setRawImageDefaultBackground");
      EXPECT_EQ(e.file, "DaduZerovoVur\\ImageProcessing");
      EXPECT_EQ(e.line, 148);
    }
  }
}

TEST(InversionRules, AnalysisAndDetection) {
  const struct {
    ImageMode mode;
    std::vector<ChannelType> types;
    std::vector<int> inverted;
    std::size_t channel;
    bool analysis;
    bool detection;
  } cases[] = {
      // Chemi: channel 0 is bright, the others dark; the host flag does not count.
      {ImageMode_Chemi, {ChType_Chemi, ChType_Chemi}, {1, 1}, 0, true, true},
      {ImageMode_Chemi, {ChType_Chemi, ChType_Chemi}, {1, 1}, 1, false, false},
      {ImageMode_UV, {ChType_NA}, {1}, 0, false, false},
      {ImageMode_Vis, {ChType_Vis}, {0}, 0, true, true},
      // Universal: a protein stain flagged inverted is inverted for analysis only.
      {ImageMode_Universal, {ChType_Protein}, {1}, 0, true, false},
      {ImageMode_Universal, {ChType_Protein}, {0}, 0, false, true},
      {ImageMode_Universal, {ChType_Vis}, {1}, 0, true, false},
      {ImageMode_Universal, {ChType_Live}, {0}, 0, true, true},
      {ImageMode_Universal, {ChType_Membrane}, {1}, 0, false, false},
      {ImageMode_Universal, {ChType_Chemi}, {1}, 0, true, true},
      {ImageMOde_Other, {ChType_Chemi}, {1}, 0, false, false},
  };
  for (const auto& c : cases) {
    const std::vector<ImageParam> params = paramsOf(c.types, c.inverted);
    std::vector<int> defaults;
    setRawImageDefaultBackground(c.mode, params, defaults, false);
    EXPECT_EQ(invertForAnalysis(c.mode, defaults, params, c.channel), c.analysis)
        << imageModeName(c.mode) << " " << channelTypeName(c.types[c.channel]);
    EXPECT_EQ(invertForDetection(c.mode, defaults, params, c.channel), c.detection)
        << imageModeName(c.mode) << " " << channelTypeName(c.types[c.channel]);
  }
}

TEST(InversionRules, ChannelBeyondTheDefaultsIsOutOfRange) {
  const std::vector<ImageParam> params = paramsOf({ChType_Vis});
  std::vector<int> defaults;
  setRawImageDefaultBackground(ImageMode_Vis, params, defaults, false);
  EXPECT_THROW(invertForAnalysis(ImageMode_Vis, defaults, params, 1), std::out_of_range);
  EXPECT_THROW(invertForDetection(ImageMode_Vis, defaults, params, 1), std::out_of_range);
  // Universal reads the parameters too.
  const std::vector<int> two{1, 1};
  EXPECT_THROW(invertForAnalysis(ImageMode_Universal, two, params, 1), std::out_of_range);
}

Image imageOf(const cv::Mat& m) {
  Image image;
  image.setMat(m);
  return image;
}

cv::Mat composed(const std::vector<cv::Mat>& channels, ImageMode mode) {
  std::vector<Image> images;
  for (const cv::Mat& m : channels) images.push_back(imageOf(m));
  Image out;
  computeImageForLaneDetection(images, mode, {}, out);
  EXPECT_EQ(out.cols(), channels[0].cols);
  EXPECT_EQ(out.rows(), channels[0].rows);
  return out.mat();
}

TEST(LaneDetectionImage, SingleFlatChannelScalesByTheFullRange) {
  // 30000 / 65535 = 0.458 after normalisation, back to 30000.
  const cv::Mat out = composed({cv::Mat(5, 6, CV_16U, cv::Scalar(30000))}, ImageMode_UV);
  EXPECT_EQ(out.type(), CV_16U);
  EXPECT_EQ(cv::countNonZero(out != 30000), 0);
}

TEST(LaneDetectionImage, SingleChannelIsStretched) {
  const cv::Mat in = (cv::Mat_<ushort>(1, 3) << 1000, 3000, 1500);
  const cv::Mat out = composed({in}, ImageMode_Protein);
  EXPECT_EQ(out.at<ushort>(0, 0), 0);
  EXPECT_EQ(out.at<ushort>(0, 1), 65535);
  EXPECT_EQ(out.at<ushort>(0, 2), 16384);  // 65535 * 0.25 = 16383.75
}

TEST(LaneDetectionImage, SignalChannelsCombineAndChannelZeroIsIgnored) {
  // Normalised 0, 1 and 0.5 in both signal channels (min 0, max 65534).
  const cv::Mat signal = (cv::Mat_<ushort>(1, 3) << 0, 65534, 32767);
  cv::Mat noise(1, 3, CV_16U);
  cv::randu(noise, 0, 65536);
  const cv::Mat out = composed({noise, signal, signal}, ImageMode_Chemi);
  EXPECT_EQ(out.at<ushort>(0, 0), 0);
  EXPECT_EQ(out.at<ushort>(0, 1), 65535);
  EXPECT_EQ(out.at<ushort>(0, 2), 49151);  // 65535 * (1 - 0.5 * 0.5)
  const cv::Mat other = composed({cv::Mat(1, 3, CV_16U, cv::Scalar(9)), signal, signal},
                                 ImageMode_Chemi);
  EXPECT_EQ(cv::countNonZero(out != other), 0);
}

TEST(LaneDetectionImage, FlatSignalChannelUsesTheFullRange) {
  const cv::Mat flat(1, 2, CV_16U, cv::Scalar(65535));
  const cv::Mat out = composed({flat, flat}, ImageMode_Fluo);
  EXPECT_EQ(out.at<ushort>(0, 0), 65535);
}

TEST(LaneDetectionImage, SingleChannelModesRefuseSeveralImages) {
  const cv::Mat m(2, 2, CV_16U, cv::Scalar(1));
  for (ImageMode mode : {ImageMode_Vis, ImageMode_UV, ImageMode_Protein, ImageMode_UV_WHITE}) {
    std::vector<Image> images{imageOf(m), imageOf(m)};
    Image out;
    try {
      computeImageForLaneDetection(images, mode, {}, out);
      ADD_FAILURE() << "no exception";
    } catch (const Exception& e) {
      EXPECT_EQ(e.code, -7);
      EXPECT_EQ(e.message, "ERROR! Image mode and channel mismatch!");
      EXPECT_EQ(e.function, "computeImageForLaneDetection");
      EXPECT_EQ(e.line, 83);
    }
  }
}

}  // namespace
}  // namespace viraduve
