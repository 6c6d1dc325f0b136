// SPDX-License-Identifier: MIT
// The mask's warp and blend as one would write them with OpenCV.
#pragma once

#include <opencv2/core.hpp>
#include <vector>

namespace n3ds::bench {

// A triangle of the face in the image and in the mask's texture, in pixels. A pixel of the
// image has its centre at +0.5; one of the texture at whole coordinates, as in N3DS_WarpFaceMask.
struct TrianglePair {
  cv::Point2f image[3], texture[3];
};

// The usual recipe: per triangle an affine warp of its bounding rectangle, copied under the
// triangle's mask. `output` is cleared.
void WarpPiecewise(const cv::Mat& texture, const std::vector<TrianglePair>& triangles,
                   cv::Mat* output);

// Where each pixel of a rectangle of the image comes from in the texture, for cv::remap; (-1, -1)
// where no triangle is.
struct CoordinateMap {
  cv::Rect where;
  cv::Mat map;  // CV_32FC2
};
CoordinateMap RenderMap(const std::vector<TrianglePair>& triangles);
// Clears the output and samples the mapped rectangle.
void WarpByMap(const cv::Mat& texture, const CoordinateMap& map, cv::Mat* output);

// Blend of the mask inside `where`, outside of which it is transparent. Matrices on floats, then
// back to bytes. `output` is an image of its own.
void BlendBgr24(const cv::Mat& image, const cv::Mat& mask, const cv::Rect& where, cv::Mat* output);
// NV21 as two matrices: luma CV_8UC1 and half-size V, U pairs CV_8UC2. `where` is even; only blocks
// that the mask touches are written.
void BlendNv21(const cv::Mat& luma, const cv::Mat& chroma, const cv::Mat& mask,
               const cv::Rect& where, cv::Mat* out_luma, cv::Mat* out_chroma);

}  // namespace n3ds::bench
