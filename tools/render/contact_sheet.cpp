// SPDX-License-Identifier: MIT
#include "render/contact_sheet.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <string>

namespace n3ds::tool {
namespace {

constexpr int kGap = 4;  // pixels between tiles

// Digits of 5 x 7 dots, a row a string.
constexpr int kGlyphWidth = 5;
constexpr int kGlyphHeight = 7;
constexpr const char* kDigits[10][kGlyphHeight] = {
    {".###.", "#...#", "#..##", "#.#.#", "##..#", "#...#", ".###."},
    {"..#..", ".##..", "..#..", "..#..", "..#..", "..#..", ".###."},
    {".###.", "#...#", "....#", "...#.", "..#..", ".#...", "#####"},
    {"#####", "...#.", "..#..", "...#.", "....#", "#...#", ".###."},
    {"...#.", "..##.", ".#.#.", "#..#.", "#####", "...#.", "...#."},
    {"#####", "#....", "####.", "....#", "....#", "#...#", ".###."},
    {"..##.", ".#...", "#....", "####.", "#...#", "#...#", ".###."},
    {"#####", "....#", "...#.", "..#..", ".#...", ".#...", ".#..."},
    {".###.", "#...#", "#...#", ".###.", "#...#", "#...#", ".###."},
    {".###.", "#...#", "#...#", ".####", "....#", "...#.", ".##.."},
};

void FillBlock(Image& image, int x, int y, int size, std::uint8_t grey) {
  for (int row = std::max(y, 0); row < std::min(y + size, image.height); ++row) {
    for (int column = std::max(x, 0); column < std::min(x + size, image.width); ++column) {
      std::fill_n(image.Pixel(column, row), 3, grey);
    }
  }
}

// White digits with a dark edge, readable on any ground. (x, y) is the upper left corner.
void DrawNumber(Image& image, std::int64_t number, int x, int y, int dot) {
  const std::string text = std::to_string(number);
  for (const bool edge : {true, false}) {
    int left = x;
    for (const char digit : text) {
      for (int row = 0; row < kGlyphHeight; ++row) {
        for (int column = 0; column < kGlyphWidth; ++column) {
          if (kDigits[digit - '0'][row][column] != '#') continue;
          const int grow = edge ? 1 : 0;
          FillBlock(image, left + column * dot - grow, y + row * dot - grow, dot + 2 * grow,
                    edge ? 20 : 255);
        }
      }
      left += (kGlyphWidth + 1) * dot;
    }
  }
}

// Columns that make the sheet about half as wide again as high, with few empty places.
int ChooseColumns(std::size_t tiles, int tile_width, int tile_height) {
  constexpr double kAspect = 1.5;
  int best = 1;
  double best_cost = std::numeric_limits<double>::max();
  const int count = static_cast<int>(tiles);
  for (int columns = 1; columns <= count; ++columns) {
    const int rows = (count + columns - 1) / columns;
    const double aspect = static_cast<double>(columns * tile_width) / (rows * tile_height);
    const double empty = static_cast<double>(columns * rows - count) / count;
    const double cost = std::abs(std::log(aspect / kAspect)) + 2 * empty;
    if (cost < best_cost) {
      best_cost = cost;
      best = columns;
    }
  }
  return best;
}

}  // namespace

std::vector<std::size_t> EvenlySpaced(std::size_t frames, std::size_t tiles) {
  std::vector<std::size_t> chosen;
  const std::size_t count = std::min(frames, tiles);
  for (std::size_t k = 0; k < count; ++k) {
    chosen.push_back(count == 1 ? 0 : (k * (frames - 1) + (count - 1) / 2) / (count - 1));
  }
  return chosen;
}

ContactSheet::ContactSheet(std::size_t tiles, int tile_width, int tile_height)
    : columns_(ChooseColumns(tiles, tile_width, tile_height)),
      tile_width_(tile_width),
      tile_height_(tile_height) {
  const int rows = (static_cast<int>(tiles) + columns_ - 1) / columns_;
  image_ = Image(columns_ * (tile_width + kGap) - kGap, rows * (tile_height + kGap) - kGap);
}

void ContactSheet::Add(const Image& tile, std::int64_t frame_number) {
  Image labelled = tile;
  constexpr int kDot = 2;
  DrawNumber(labelled, frame_number, 6, tile_height_ - kGlyphHeight * kDot - 6, kDot);
  Paste(labelled, added_ % columns_ * (tile_width_ + kGap),
        added_ / columns_ * (tile_height_ + kGap), image_);
  ++added_;
}

}  // namespace n3ds::tool
