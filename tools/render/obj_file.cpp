// SPDX-License-Identifier: MIT
#include "render/obj_file.h"

#include <algorithm>
#include <fstream>
#include <map>
#include <sstream>
#include <utility>

#include "support/error.h"

namespace n3ds::tool {
namespace {

// Ns at which a material counts as fully glossy.
constexpr float kFullGloss = 100;

class LineReader {
 public:
  explicit LineReader(std::string path) : path_(std::move(path)), in_(path_) {
    if (!in_) throw Error(path_ + ": cannot be opened");
  }
  bool Next(std::istringstream& words) {
    std::string line;
    if (!std::getline(in_, line)) return false;
    ++number_;
    words.clear();
    words.str(line);
    return true;
  }
  [[noreturn]] void Fail(const std::string& sentence) const {
    throw Error(path_ + ":" + std::to_string(number_) + ": " + sentence);
  }

 private:
  std::string path_;
  std::ifstream in_;
  std::size_t number_ = 0;
};

std::array<float, 3> ReadTriple(const LineReader& reader, std::istringstream& words) {
  std::array<float, 3> triple{};
  if (!(words >> triple[0] >> triple[1] >> triple[2])) reader.Fail("expected three numbers");
  return triple;
}

std::map<std::string, Material> ReadMaterials(const std::string& path) {
  LineReader reader(path);
  std::map<std::string, Material> materials;
  Material* current = nullptr;
  std::istringstream words;
  while (reader.Next(words)) {
    std::string keyword;
    words >> keyword;
    if (keyword == "newmtl") {
      std::string name;
      words >> name;
      current = &materials[name];
      continue;
    }
    if (keyword != "Kd" && keyword != "d" && keyword != "Ns") continue;
    if (current == nullptr) reader.Fail("a property stands before the first newmtl");
    if (keyword == "Kd") {
      current->colour = ReadTriple(reader, words);
    } else {
      float value = 0;
      if (!(words >> value)) reader.Fail("expected a number");
      if (keyword == "d") {
        current->opacity = value;
      } else {
        current->gloss = std::clamp(value / kFullGloss, 0.0F, 1.0F);
      }
    }
  }
  return materials;
}

// Builds the mesh: OBJ counts positions and normals apart, the mesh has one index for both.
class ObjBuilder {
 public:
  void AddFace(const LineReader& reader, std::istringstream& words) {
    std::vector<std::uint32_t> corners;
    std::string corner;
    while (words >> corner) corners.push_back(VertexOf(reader, corner));
    if (corners.size() < 3) reader.Fail("a face has fewer than three corners");
    if (mesh.parts.empty()) mesh.parts.emplace_back();
    for (std::size_t k = 2; k < corners.size(); ++k) {
      mesh.indices.insert(mesh.indices.end(), {corners[0], corners[k - 1], corners[k]});
      mesh.parts.back().index_count += 3;
    }
  }

  void StartPart(const Material& material) {
    mesh.parts.push_back({material, mesh.indices.size(), 0});
  }

  Mesh mesh;
  std::vector<std::array<float, 3>> positions;
  std::vector<std::array<float, 3>> normals;

 private:
  std::uint32_t VertexOf(const LineReader& reader, const std::string& corner) {
    const auto known = index_.find(corner);
    if (known != index_.end()) return known->second;
    const std::size_t last_slash = corner.rfind('/');
    if (last_slash == std::string::npos || corner.find('/') == last_slash) {
      reader.Fail("corner " + corner + " has no normal (expected v//vn)");
    }
    Vertex vertex;
    vertex.position = Entry(reader, positions, corner.substr(0, corner.find('/')));
    vertex.normal = Entry(reader, normals, corner.substr(last_slash + 1));
    const auto index = static_cast<std::uint32_t>(mesh.vertices.size());
    mesh.vertices.push_back(vertex);
    index_[corner] = index;
    return index;
  }

  static const std::array<float, 3>& Entry(const LineReader& reader,
                                           const std::vector<std::array<float, 3>>& entries,
                                           const std::string& number) {
    std::size_t index = 0;
    std::istringstream in(number);
    if (!(in >> index) || index < 1 || index > entries.size()) {
      reader.Fail("there is no entry " + number);
    }
    return entries[index - 1];
  }

  std::map<std::string, std::uint32_t> index_;
};

}  // namespace

Mesh ReadObj(const std::string& path) {
  LineReader reader(path);
  ObjBuilder builder;
  std::map<std::string, Material> materials;
  std::istringstream words;
  while (reader.Next(words)) {
    std::string keyword;
    words >> keyword;
    if (keyword == "v") {
      builder.positions.push_back(ReadTriple(reader, words));
    } else if (keyword == "vn") {
      builder.normals.push_back(ReadTriple(reader, words));
    } else if (keyword == "f") {
      builder.AddFace(reader, words);
    } else if (keyword == "mtllib") {
      std::string name;
      words >> name;
      materials = ReadMaterials(path.substr(0, path.find_last_of('/') + 1) + name);
    } else if (keyword == "usemtl") {
      std::string name;
      words >> name;
      const auto found = materials.find(name);
      if (found == materials.end()) reader.Fail("there is no material " + name);
      builder.StartPart(found->second);
    }
  }
  if (builder.mesh.indices.empty()) throw Error(path + ": file contains no faces");
  return std::move(builder.mesh);
}

}  // namespace n3ds::tool
