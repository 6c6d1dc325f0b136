// SPDX-License-Identifier: MIT
// What commands write: which format, and not over what they read.
#pragma once

#include <cstdio>
#include <string>
#include <vector>

#include "render/image.h"

namespace n3ds::tool {

enum class OutputFormat { kPng, kJpeg, kFilm, kObj, kFolder };

// The format that the ending of a path asks for. A folder has no ending, a slash behind it or is
// there already; a device or pipe without an ending takes the first format. Throws UsageError, which lists the
// `known` formats' endings, for anything else.
OutputFormat FormatOf(const std::string& option, const std::string& path,
                      const std::vector<OutputFormat>& known);

// Writes a PNG or a JPEG, whole or not at all. Throws Error.
void WriteImage(const std::string& path, OutputFormat format, const Image& image);

// Where a command says what it has done: standard output, or standard error when the path of its
// output leads to where standard output goes, whose reader wants that output alone.
std::FILE* ConsoleBeside(const std::string& output);

// Throws UsageError when `output` is the same file as one of the inputs, by whatever name. "-"
// stands for standard input.
void CheckIsNoInput(const std::string& output, const std::vector<std::string>& inputs);

}  // namespace n3ds::tool
