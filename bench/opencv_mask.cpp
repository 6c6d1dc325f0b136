// SPDX-License-Identifier: MIT
#include "opencv_mask.h"

#include <algorithm>
#include <cmath>
#include <opencv2/imgproc.hpp>

namespace n3ds::bench {

namespace {

cv::Rect BoundingRect(const cv::Point2f* corners, const cv::Size& image) {
  float left = corners[0].x, right = left, top = corners[0].y, bottom = top;
  for (int c = 1; c < 3; ++c) {
    left = std::min(left, corners[c].x);
    right = std::max(right, corners[c].x);
    top = std::min(top, corners[c].y);
    bottom = std::max(bottom, corners[c].y);
  }
  const cv::Point from(cvFloor(left), cvFloor(top));
  const cv::Point to(cvCeil(right) + 1, cvCeil(bottom) + 1);
  return cv::Rect(from, to) & cv::Rect(cv::Point(), image);
}

double Cross(const cv::Point2f& a, const cv::Point2f& b, const cv::Point2f& p) {
  return double{b.x - a.x} * double{p.y - a.y} - double{b.y - a.y} * double{p.x - a.x};
}

}  // namespace

void WarpPiecewise(const cv::Mat& texture, const std::vector<TrianglePair>& triangles,
                   cv::Mat* output) {
  output->setTo(cv::Scalar::all(0));
  // Buffers large enough for any triangle, so that the loop allocates nothing.
  cv::Mat warped(output->size(), CV_8UC4), inside(output->size(), CV_8UC1);
  for (const TrianglePair& t : triangles) {
    const cv::Rect box = BoundingRect(t.image, output->size());
    if (box.empty()) continue;
    cv::Point2f corners[3];
    cv::Point fixed[3];  // with 8 fractional bits
    for (int c = 0; c < 3; ++c) {
      const cv::Point2f corner = t.image[c] - cv::Point2f(0.5f, 0.5f);  // centres at whole numbers
      corners[c] = corner - cv::Point2f(box.tl());
      fixed[c] = cv::Point(cvRound(corners[c].x * 256), cvRound(corners[c].y * 256));
    }
    cv::Mat target = (*output)(box);
    cv::Mat piece = warped(cv::Rect(cv::Point(), box.size()));
    cv::Mat mask = inside(cv::Rect(cv::Point(), box.size()));
    cv::warpAffine(texture, piece, cv::getAffineTransform(corners, t.texture), box.size(),
                   cv::INTER_LINEAR | cv::WARP_INVERSE_MAP, cv::BORDER_REPLICATE);
    mask.setTo(0);
    cv::fillConvexPoly(mask, fixed, 3, cv::Scalar(255), cv::LINE_8, 8);
    piece.copyTo(target, mask);
  }
}

CoordinateMap RenderMap(const std::vector<TrianglePair>& triangles) {
  std::vector<cv::Point2f> corners;
  for (const TrianglePair& t : triangles) corners.insert(corners.end(), t.image, t.image + 3);
  CoordinateMap result;
  result.where = cv::boundingRect(corners);
  result.map = cv::Mat(result.where.size(), CV_32FC2, cv::Scalar(-1, -1));
  const cv::Point2f origin(result.where.tl());
  for (const TrianglePair& t : triangles) {
    cv::Point2f p[3];
    for (int c = 0; c < 3; ++c) p[c] = t.image[c] - origin;
    const double area = Cross(p[0], p[1], p[2]);
    if (area == 0) continue;
    const cv::Rect box = BoundingRect(p, result.where.size());
    for (int y = box.y; y < box.br().y; ++y) {
      for (int x = box.x; x < box.br().x; ++x) {
        const cv::Point2f centre(static_cast<float>(x) + 0.5f, static_cast<float>(y) + 0.5f);
        const auto b0 = static_cast<float>(Cross(p[1], p[2], centre) / area);
        const auto b1 = static_cast<float>(Cross(p[2], p[0], centre) / area);
        const float b2 = 1.0f - b0 - b1;
        if (b0 < 0 || b1 < 0 || b2 < 0) continue;
        const cv::Point2f at = b0 * t.texture[0] + b1 * t.texture[1] + b2 * t.texture[2];
        result.map.at<cv::Vec2f>(y, x) = {at.x, at.y};
      }
    }
  }
  return result;
}

void WarpByMap(const cv::Mat& texture, const CoordinateMap& map, cv::Mat* output) {
  output->setTo(cv::Scalar::all(0));
  cv::Mat target = (*output)(map.where);
  cv::remap(texture, target, map.map, cv::noArray(), cv::INTER_LINEAR, cv::BORDER_TRANSPARENT);
}

namespace {

// colour += alpha / 256 (shading mask - colour), with shading = 0.5 + 0.5 grey.
cv::Mat BlendColours(const cv::Mat& colour, const cv::Mat& mask) {
  const cv::Matx34f grey_row(0.15f / 255, 0.15f / 255, 0.2f / 255, 0.5f, 0.15f / 255, 0.15f / 255,
                             0.2f / 255, 0.5f, 0.15f / 255, 0.15f / 255, 0.2f / 255, 0.5f);
  cv::Mat image, over, shading, mask_colour(mask.size(), CV_8UC3), alpha(mask.size(), CV_8UC3),
      weight;
  cv::Mat parts[] = {mask_colour, alpha};
  const int channels[] = {0, 0, 1, 1, 2, 2, 3, 3, 3, 4, 3, 5};
  cv::mixChannels(&mask, 1, parts, 2, channels, 6);
  colour.convertTo(image, CV_32F);
  mask_colour.convertTo(over, CV_32F);
  alpha.convertTo(weight, CV_32F, 1.0 / 256);
  cv::transform(image, shading, grey_row);
  cv::multiply(over, shading, over);
  cv::subtract(over, image, over);
  cv::multiply(over, weight, over);
  cv::add(image, over, image);
  cv::Mat bytes;
  image.convertTo(bytes, CV_8U);
  return bytes;
}

}  // namespace

void BlendBgr24(const cv::Mat& image, const cv::Mat& mask, const cv::Rect& where, cv::Mat* output) {
  image.copyTo(*output);
  BlendColours(image(where), mask(where)).copyTo((*output)(where));
}

void BlendNv21(const cv::Mat& luma, const cv::Mat& chroma, const cv::Mat& mask,
               const cv::Rect& where, cv::Mat* out_luma, cv::Mat* out_chroma) {
  const cv::Rect half(where.x / 2, where.y / 2, where.width / 2, where.height / 2);
  // Full-range BT.601: blue, green, red of Y, V, U, and Y, U, V of blue, green, red.
  const cv::Matx34f to_bgr(1, 0, 1.772f, -1.772f * 128, 1, -0.714136f, -0.344136f,
                           (0.714136f + 0.344136f) * 128, 1, 1.402f, 0, -1.402f * 128);
  const cv::Matx34f to_yvu(0.114f, 0.587f, 0.299f, 0, -0.081312f, -0.418688f, 0.5f, 128, 0.5f,
                           -0.331264f, -0.168736f, 128);
  cv::Mat wide_chroma, yvu, bgr;
  cv::resize(chroma(half), wide_chroma, where.size(), 0, 0, cv::INTER_NEAREST);
  const cv::Mat planes[] = {luma(where), wide_chroma};
  yvu.create(where.size(), CV_8UC3);
  const int channels[] = {0, 0, 1, 1, 2, 2};
  cv::mixChannels(planes, 2, &yvu, 1, channels, 3);
  cv::transform(yvu, bgr, to_bgr);
  cv::transform(BlendColours(bgr, mask(where)), yvu, to_yvu);

  cv::Mat new_luma(where.size(), CV_8UC1), new_chroma(where.size(), CV_8UC2), small_chroma;
  cv::Mat split[] = {new_luma, new_chroma};
  cv::mixChannels(&yvu, 1, split, 2, channels, 3);
  cv::resize(new_chroma, small_chroma, half.size(), 0, 0, cv::INTER_AREA);
  cv::Mat touched, touched_blocks, touched_pixels;
  cv::extractChannel(mask(where), touched, 3);
  cv::threshold(touched, touched, 0, 255, cv::THRESH_BINARY);
  cv::resize(touched, touched_blocks, half.size(), 0, 0, cv::INTER_AREA);
  cv::resize(touched_blocks, touched_pixels, where.size(), 0, 0, cv::INTER_NEAREST);
  new_luma.copyTo((*out_luma)(where), touched_pixels);
  small_chroma.copyTo((*out_chroma)(half), touched_blocks);
}

}  // namespace n3ds::bench
