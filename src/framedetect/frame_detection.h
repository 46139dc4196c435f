// Frame detection: the rectangles of the membranes or gels lying in one capture image.
#pragma once

#include <vector>

#include <opencv2/core.hpp>

#include "viraduve/records.h"

namespace viraduve {

// Replaces roiListOut by the frames found in an 8-bit grey image (CV_8UC1), in its pixel
// coordinates. Frames of the blob route have exclusive right/bottom corners, those of the
// edge route inclusive ones. An empty image leaves roiListOut as it was. Logs its steps.
void detectFrames(const cv::Mat& grey, std::vector<ROI>& roiListOut, float ratation_angle,
                  ImageMode mode);
// The same on encoded image bytes, decoded as 8-bit grey; undecodable bytes count as empty.
void detectFrames(const std::vector<unsigned char>& imageBytes, std::vector<ROI>& roiListOut,
                  float ratation_angle, ImageMode mode);

// The blob route: frames of a clearly bimodal image as the bounding boxes (exclusive
// right/bottom) of its large blobs; empty when the image does not qualify.
std::vector<ROI> detectFramesByBlobs(const cv::Mat& grey);

// Rotates src by angleDegrees about its centre on a square canvas of its diagonal and crops
// to the rotated extent. fillMode 1 fills uncovered pixels white, any other value black.
// src and dst may be the same matrix.
void rotateImage(const cv::Mat& src, cv::Mat& dst, float angleDegrees, int fillMode);

// Per hull, the length-weighted mean angle (radians) of its edges within maxAngle of the
// horizontal, ignoring edges along an image border (NaN when none is left). Logs the angles.
std::vector<float> computeFrameAngles(const std::vector<std::vector<cv::Point>>& hulls,
                                      cv::Size imageSize, float maxAngle);

}  // namespace viraduve
