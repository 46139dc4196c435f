// The blob kernel against OpenCV as an independent oracle (Otsu, morphology, labelling),
// plus its argument checks and the cases OpenCV cannot judge.
#include <algorithm>
#include <random>
#include <tuple>
#include <vector>

#include <gtest/gtest.h>
#include <opencv2/imgproc.hpp>

#include "framedetect/blobkit/blob_finder.h"
#include "framedetect/blobkit/histogram.h"
#include "framedetect/blobkit/run_morphology.h"
#include "framedetect/blobkit/threshold.h"

namespace {

using blobkit::GreyImage;

GreyImage fromMat(const cv::Mat& m) {
  GreyImage image(m.cols, m.rows);
  for (int r = 0; r < m.rows; ++r) std::copy(m.ptr(r), m.ptr(r) + m.cols, image.row(r));
  return image;
}

cv::Mat toMat(const GreyImage& image) {
  cv::Mat m(image.height(), image.width(), CV_8UC1);
  for (int r = 0; r < m.rows; ++r) std::copy(image.row(r), image.row(r) + m.cols, m.ptr(r));
  return m;
}

// Random binary image: blobs of varied sizes from thresholded smoothed noise.
cv::Mat randomBinary(int width, int height, unsigned seed, double blurSigma, int level) {
  cv::RNG rng(seed);
  cv::Mat noise(height, width, CV_8UC1);
  rng.fill(noise, cv::RNG::UNIFORM, 0, 256);
  if (blurSigma > 0) cv::GaussianBlur(noise, noise, cv::Size(0, 0), blurSigma);
  cv::Mat binary;
  cv::threshold(noise, binary, level, 255, cv::THRESH_BINARY);
  return binary;
}

std::string messageOf(const std::function<void()>& f) {
  try {
    f();
  } catch (const blobkit::imageException& e) {
    return e.what();
  }
  return "";
}

// Two-mode grey images of varied balance and spread.
cv::Mat bimodal(int width, int height, unsigned seed, int lowMean, int highMean, int spread,
                double highShare) {
  std::mt19937 rng(seed);
  std::normal_distribution<double> low(lowMean, spread), high(highMean, spread);
  std::uniform_real_distribution<double> pick(0.0, 1.0);
  cv::Mat m(height, width, CV_8UC1);
  for (int r = 0; r < height; ++r) {
    for (int c = 0; c < width; ++c) {
      m.at<uchar>(r, c) = cv::saturate_cast<uchar>(pick(rng) < highShare ? high(rng) : low(rng));
    }
  }
  return m;
}

TEST(OtsuThreshold, SplitsLikeOpenCv) {
  // Both place the levels <= t in the lower class, so the kernel's t equals OpenCV's
  // returned t_cv. The binarisations then differ by one level: OpenCV's THRESH_BINARY keeps
  // v > t_cv, thresholdImage keeps v >= t (the level t itself goes to the upper class).
  const std::vector<std::tuple<int, int, int, double>> cases = {
      {40, 200, 15, 0.5}, {60, 120, 20, 0.2}, {10, 240, 5, 0.9}, {90, 160, 30, 0.4},
      {5, 30, 4, 0.7},    {100, 220, 40, 0.05}};
  unsigned seed = 1;
  for (const auto& [low, high, spread, share] : cases) {
    const cv::Mat m = bimodal(160, 120, seed++, low, high, spread, share);
    std::vector<uint32_t> histogram;
    blobkit::computeHistogram(fromMat(m), histogram);
    const uint8_t t = blobkit::otsuThreshold(histogram);
    cv::Mat cvBinary;
    const double tCv = cv::threshold(m, cvBinary, 0, 255, cv::THRESH_BINARY | cv::THRESH_OTSU);
    EXPECT_EQ(t, static_cast<int>(tCv)) << low << " " << high;

    GreyImage ours;
    blobkit::thresholdImage(fromMat(m), ours, t);
    cv::Mat expected;
    cv::threshold(m, expected, t - 1, 255, cv::THRESH_BINARY);  // v > t - 1 is v >= t
    EXPECT_EQ(cv::countNonZero(toMat(ours) != expected), 0);
  }
}

TEST(OtsuThreshold, DegenerateHistograms) {
  std::vector<uint32_t> oneBin(256, 0);
  oneBin[77] = 1000;
  EXPECT_EQ(blobkit::otsuThreshold(oneBin), 0);
  EXPECT_EQ(blobkit::otsuThreshold(std::vector<uint32_t>(256, 0)), 0);
  // Two levels: the split lies at the lower one.
  std::vector<uint32_t> twoBins(256, 0);
  twoBins[10] = 5;
  twoBins[200] = 7;
  EXPECT_EQ(blobkit::otsuThreshold(twoBins), 10);
  // Symmetric three levels: both splits score the same, the first wins.
  std::vector<uint32_t> three(256, 0);
  three[0] = three[100] = three[200] = 10;
  EXPECT_EQ(blobkit::otsuThreshold(three), 0);
  for (std::size_t size : {255u, 257u, 0u}) {
    EXPECT_EQ(messageOf([&] { blobkit::otsuThreshold(std::vector<uint32_t>(size, 1)); }),
              "Histogram size is not 256");
  }
}

TEST(ImageFunctions, RejectBadRegionsAndColourImages) {
  const GreyImage image(10, 8);
  std::vector<uint32_t> h;
  const std::string bad = "Bad input parameters in image function";
  EXPECT_EQ(messageOf([&] { blobkit::computeHistogram(image, 1, 0, 10, 8, h); }), bad);
  EXPECT_EQ(messageOf([&] { blobkit::computeHistogram(image, 0, 1, 10, 8, h); }), bad);
  EXPECT_EQ(messageOf([&] { blobkit::computeHistogram(image, 0, 0, 0, 8, h); }), bad);
  EXPECT_EQ(messageOf([&] { blobkit::computeHistogram(image, 0, 0, 10, 0, h); }), bad);
  EXPECT_EQ(messageOf([&] { blobkit::computeHistogram(GreyImage(), h); }), bad);
  // Near-overflow offsets must not wrap round into a valid region.
  EXPECT_EQ(messageOf([&] { blobkit::computeHistogram(image, 0xFFFFFFFFu, 0, 2, 8, h); }), bad);
  EXPECT_EQ(messageOf([&] { blobkit::computeHistogram(image, 0, 0, 10, 8, h); }), "");
  EXPECT_EQ(h.size(), 256u);
  EXPECT_EQ(h[0], 80u);

  GreyImage colour(10, 8, 3);
  GreyImage twoChannel(10, 8, 2);
  blobkit::BlobFinder finder;
  EXPECT_EQ(messageOf([&] { blobkit::erodeRuns(colour, 1, 1); }),
            "Bad input parameters in image function: gray-scaled image has more than 1 color "
            "channels");
  EXPECT_EQ(messageOf([&] { finder.find(twoChannel, {}, 1); }), bad);
  EXPECT_EQ(messageOf([&] { finder.find(image, 5, 0, 6, 8, {}, 1); }), bad);
}

// For binary images the run-based operations are separable rectangle morphology.
TEST(RunMorphology, MatchesRectangleMorphologyOnRandomImages) {
  for (unsigned seed = 1; seed <= 12; ++seed) {
    const int width = 40 + 13 * static_cast<int>(seed);
    const int height = 30 + 7 * static_cast<int>(seed);
    const cv::Mat binary = randomBinary(width, height, seed, seed % 3 == 0 ? 0.0 : 2.0, 128);
    const uint32_t sx = 1 + seed % 6;
    const uint32_t sy = 1 + (seed * 5) % 7;
    const cv::Mat kernel = cv::Mat::ones(2 * sy + 1, 2 * sx + 1, CV_8UC1);

    GreyImage eroded = fromMat(binary);
    blobkit::erodeRuns(eroded, sx, sy);
    cv::Mat expected;
    cv::erode(binary, expected, kernel);
    EXPECT_EQ(cv::countNonZero(toMat(eroded) != expected), 0) << "erode, seed " << seed;

    GreyImage dilated = fromMat(binary);
    blobkit::dilateRuns(dilated, sx, sy);
    cv::dilate(binary, expected, kernel);
    EXPECT_EQ(cv::countNonZero(toMat(dilated) != expected), 0) << "dilate, seed " << seed;
  }
}

TEST(RunMorphology, ThinLineDoesNotSurviveOpening) {
  cv::Mat m = cv::Mat::zeros(40, 60, CV_8UC1);
  cv::line(m, {5, 20}, {55, 20}, 255);   // 1 pixel high
  cv::line(m, {30, 2}, {30, 38}, 255);   // 1 pixel wide
  cv::rectangle(m, cv::Rect(5, 25, 20, 12), 255, cv::FILLED);
  GreyImage image = fromMat(m);
  blobkit::erodeRuns(image, 5, 5);
  blobkit::dilateRuns(image, 5, 5);
  cv::Mat expected = cv::Mat::zeros(40, 60, CV_8UC1);
  cv::rectangle(expected, cv::Rect(5, 25, 20, 12), 255, cv::FILLED);
  EXPECT_EQ(cv::countNonZero(toMat(image) != expected), 0);
}

TEST(RunMorphology, SizeIsLimitedToHalfTheImage) {
  // A 4-pixel-wide image: sizeX 10 acts as 2, so a white run in the middle survives dilation
  // no wider than the image and erosion of the all-white row changes nothing.
  cv::Mat m = (cv::Mat_<uchar>(1, 4) << 0, 255, 0, 0);
  GreyImage image = fromMat(m);
  blobkit::dilateRuns(image, 10, 10);
  EXPECT_EQ(cv::countNonZero(toMat(image)), 4);
  blobkit::erodeRuns(image, 10, 10);
  EXPECT_EQ(cv::countNonZero(toMat(image)), 4);
}

struct Box {
  int left, top, right, bottom, size;
  bool operator<(const Box& o) const {
    return std::tie(left, top, right, bottom, size) <
           std::tie(o.left, o.top, o.right, o.bottom, o.size);
  }
  bool operator==(const Box& o) const { return !(*this < o) && !(o < *this); }
};

TEST(BlobFinder, MatchesEightConnectedComponents) {
  for (unsigned seed = 1; seed <= 10; ++seed) {
    const cv::Mat binary =
        randomBinary(50 + 9 * seed, 40 + 11 * seed, seed, seed % 2 ? 1.5 : 0.0, 140);
    blobkit::BlobFinder finder;
    finder.find(fromMat(binary), {}, 1);

    cv::Mat labels, stats, centroids;
    const int n = cv::connectedComponentsWithStats(binary, labels, stats, centroids, 8);
    std::vector<Box> expected;
    for (int i = 1; i < n; ++i) {
      const int* s = stats.ptr<int>(i);
      expected.push_back({s[cv::CC_STAT_LEFT], s[cv::CC_STAT_TOP],
                          s[cv::CC_STAT_LEFT] + s[cv::CC_STAT_WIDTH],
                          s[cv::CC_STAT_TOP] + s[cv::CC_STAT_HEIGHT], s[cv::CC_STAT_AREA]});
    }
    std::vector<Box> found;
    for (const auto& blob : finder.blobs()) {
      const auto& b = blob.bounds();
      found.push_back({int(b.left), int(b.top), int(b.right), int(b.bottom), int(blob.size())});
      EXPECT_EQ(blob.pixelX.size(), blob.pixelY.size());
      EXPECT_LE(blob.borderX.size(), blob.size());
      EXPECT_GE(blob.outlineX.size(), 1u);
    }
    std::sort(expected.begin(), expected.end());
    std::sort(found.begin(), found.end());
    EXPECT_EQ(found, expected) << "seed " << seed;
  }
}

TEST(BlobFinder, ScanOrderBordersAndRegions) {
  cv::Mat m = cv::Mat::zeros(20, 30, CV_8UC1);
  cv::rectangle(m, cv::Rect(2, 2, 4, 4), 255, cv::FILLED);
  cv::rectangle(m, cv::Rect(6, 6, 4, 4), 255, cv::FILLED);  // touches the first at a corner
  m.at<uchar>(1, 20) = 1;                                    // exactly the level
  m.at<uchar>(15, 25) = 200;
  blobkit::BlobFinder finder;
  finder.find(fromMat(m), {}, 1);
  ASSERT_EQ(finder.blobs().size(), 3u);
  auto it = finder.blobs().begin();
  // Blobs come in the raster order of their first pixel.
  const auto& single = *it++;
  EXPECT_EQ(single.size(), 1u);
  EXPECT_EQ(single.borderX.size(), 1u);
  EXPECT_EQ(single.bounds().left, 20u);
  EXPECT_EQ(single.bounds().right, 21u);
  EXPECT_EQ(single.bounds().top, 1u);
  EXPECT_EQ(single.bounds().bottom, 2u);
  const auto& squares = *it++;
  EXPECT_EQ(squares.size(), 32u);
  EXPECT_EQ(squares.bounds().left, 2u);
  EXPECT_EQ(squares.bounds().bottom, 10u);
  // Interior pixels of the 4x4 squares have all 8 neighbours: 2x2 each, minus none.
  EXPECT_EQ(squares.borderX.size(), 32u - 8u);
  EXPECT_EQ(squares.pixelX.front(), 2u);
  EXPECT_EQ(squares.pixelY.front(), 2u);
  EXPECT_EQ(squares.outlineX.front(), 2u);

  // A sub-region reports image coordinates; cut at (5, 5), the first square keeps one
  // pixel, which still touches the second at a corner.
  blobkit::BlobFinder part;
  part.find(fromMat(m), 5, 5, 10, 10, {}, 1);
  ASSERT_EQ(part.blobs().size(), 1u);
  const auto& b = part.blobs().front().bounds();
  EXPECT_EQ(std::make_tuple(b.left, b.top, b.right, b.bottom), std::make_tuple(5u, 5u, 10u, 10u));
  EXPECT_EQ(part.blobs().front().size(), 17u);
}

TEST(BlobFinder, LargestBlobAndCriteria) {
  cv::Mat m = cv::Mat::zeros(20, 40, CV_8UC1);
  cv::rectangle(m, cv::Rect(1, 1, 3, 4), 255, cv::FILLED);    // 12 pixels, 3 wide
  cv::rectangle(m, cv::Rect(10, 1, 6, 2), 255, cv::FILLED);   // 12 pixels, 6 wide
  cv::rectangle(m, cv::Rect(20, 10, 2, 2), 255, cv::FILLED);  // 4 pixels
  blobkit::BlobFinder finder;
  EXPECT_EQ(finder.largestBlob(blobkit::BlobProperty_PixelCount), nullptr);
  finder.find(fromMat(m), {}, 1);
  // Equal counts: the first found wins.
  const auto* largest = finder.largestBlob(blobkit::BlobProperty_PixelCount);
  ASSERT_NE(largest, nullptr);
  EXPECT_EQ(largest->bounds().left, 1u);
  EXPECT_EQ(finder.largestBlob(blobkit::BlobProperty_Width)->bounds().left, 10u);
  EXPECT_EQ(messageOf([&] { finder.largestBlob(6); }), "Bad criterion for blob finding");
  EXPECT_EQ(messageOf([&] { finder.largestBlob(-1); }), "Bad criterion for blob finding");

  blobkit::BlobCriteria criteria;
  criteria.limits[blobkit::BlobProperty_PixelCount].checkMin = true;
  criteria.limits[blobkit::BlobProperty_PixelCount].min = 5;
  criteria.limits[blobkit::BlobProperty_Height].checkMax = true;
  criteria.limits[blobkit::BlobProperty_Height].max = 3;
  finder.find(fromMat(m), criteria, 1);
  ASSERT_EQ(finder.blobs().size(), 1u);
  EXPECT_EQ(finder.blobs().front().bounds().left, 10u);
}

}  // namespace
