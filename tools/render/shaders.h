// SPDX-License-Identifier: MIT
// The shaders of everything that is drawn, GLSL ES 3.00 without the version line.
#pragma once

namespace n3ds::tool {

// Lit from the upper left before the head, softly from all sides; seen from both sides, because a
// hat has an inside.
inline constexpr char kSolidVertex[] = R"(
layout(location = 0) in vec3 position;
layout(location = 1) in vec3 normal;
uniform mat4 projection;
uniform mat4 view;
uniform mat4 model;
out vec3 eye_position;
out vec3 eye_normal;
void main() {
  vec4 eye = view * model * vec4(position, 1.0);
  eye_position = eye.xyz;
  eye_normal = mat3(view) * mat3(model) * normal;
  gl_Position = projection * eye;
})";

inline constexpr char kSolidFragment[] = R"(
in vec3 eye_position;
in vec3 eye_normal;
uniform vec3 colour;
uniform float opacity;
uniform float gloss;
out vec4 result;
void main() {
  vec3 n = normalize(gl_FrontFacing ? eye_normal : -eye_normal);
  vec3 to_light = normalize(vec3(-0.45, 0.75, 0.70));
  vec3 to_viewer = normalize(-eye_position);
  float sky = 0.5 + 0.5 * n.y;
  float direct = max(dot(n, to_light), 0.0);
  float highlight = pow(max(dot(n, normalize(to_light + to_viewer)), 0.0), mix(20.0, 150.0, gloss)) * gloss;
  vec3 lit = colour * (mix(0.30, 0.50, sky) + 0.60 * direct) + vec3(highlight);
  result = vec4(lit, clamp(opacity + highlight, 0.0, 1.0));
})";

// As in a portrait studio: a strong light from the upper left, a weak one from the right, so that
// the form shows on both halves. The inside, seen through eyes and mouth, is dark.
inline constexpr char kStudioFragment[] = R"(
in vec3 eye_position;
in vec3 eye_normal;
uniform vec3 colour;
out vec4 result;
void main() {
  vec3 n = normalize(eye_normal);
  vec3 to_viewer = normalize(-eye_position);
  vec3 to_light = normalize(vec3(-0.55, 0.60, 0.75));
  float direct = max(dot(n, to_light), 0.0);
  float fill = max(dot(n, normalize(vec3(0.80, 0.10, 0.50))), 0.0);
  float sky = 0.5 + 0.5 * n.y;
  float highlight = 0.10 * pow(max(dot(n, normalize(to_light + to_viewer)), 0.0), 22.0);
  vec3 lit = colour * (0.14 + 0.12 * sky + 0.66 * direct + 0.18 * fill) + vec3(highlight);
  result = vec4(gl_FrontFacing ? lit : 0.25 * colour, 1.0);
})";

inline constexpr char kDotVertex[] = R"(
layout(location = 0) in vec3 position;
uniform mat4 projection;
uniform mat4 view;
uniform mat4 model;
uniform float size;
void main() {
  gl_Position = projection * view * model * vec4(position, 1.0);
  gl_PointSize = size;
})";

inline constexpr char kDotFragment[] = R"(
uniform float size;
out vec4 result;
void main() {
  float radius = length(gl_PointCoord - 0.5) * size;
  result = vec4(0.10, 0.95, 0.55, clamp(0.5 * size - radius, 0.0, 1.0));
})";

// One triangle over the whole image; `place` runs from (0, 0) in the upper left corner to (1, 1).
inline constexpr char kGroundVertex[] = R"(
out vec2 place;
void main() {
  vec2 corner = vec2(float((gl_VertexID << 1) & 2), float(gl_VertexID & 2));
  place = vec2(corner.x, 1.0 - corner.y);
  gl_Position = vec4(corner * 2.0 - 1.0, 0.0, 1.0);
})";

inline constexpr char kGroundFragment[] = R"(
in vec2 place;
uniform bool has_image;
uniform sampler2D image;
out vec4 result;
void main() {
  float shade = 0.62 - 0.22 * place.y - 0.10 * length(place - 0.5);
  result = has_image ? vec4(texture(image, place).rgb, 1.0)
                       : vec4(vec3(0.92, 0.97, 1.04) * shade, 1.0);
})";

// The mask image on the dense mesh. Its colours are multiplied by their alpha beforehand, so that
// what hides in transparent places does not bleed over the edges.
inline constexpr char kMaskVertex[] = R"(
layout(location = 0) in vec3 position;
layout(location = 1) in vec3 normal;
layout(location = 2) in vec2 texture_coordinate;
uniform mat4 projection;
uniform mat4 view;
uniform mat4 model;
out vec3 eye_normal;
out vec2 place;
void main() {
  eye_normal = mat3(view) * mat3(model) * normal;
  place = texture_coordinate;
  gl_Position = projection * (view * model * vec4(position, 1.0));
})";

inline constexpr char kMaskFragment[] = R"(
in vec3 eye_normal;
in vec2 place;
uniform sampler2D image;
out vec4 result;
void main() {
  vec3 n = normalize(eye_normal);
  float direct = max(dot(n, normalize(vec3(-0.45, 0.75, 0.70))), 0.0);
  vec4 colour = texture(image, place);
  result = vec4(min(colour.rgb * (0.68 + 0.42 * direct), vec3(colour.a)), colour.a);
})";

// Every triangle's own edges, by the distance to them; an edge that two triangles share is drawn
// half by each.
inline constexpr char kWireVertex[] = R"(
layout(location = 0) in vec3 position;
uniform mat4 projection;
uniform mat4 view;
uniform mat4 model;
out vec3 weights;
void main() {
  int corner = gl_VertexID % 3;
  weights = vec3(corner == 0, corner == 1, corner == 2);
  gl_Position = projection * (view * model * vec4(position, 1.0));
})";

inline constexpr char kWireFragment[] = R"(
in vec3 weights;
uniform vec3 colour;
uniform float half_width;
out vec4 result;
void main() {
  vec3 distances = weights / fwidth(weights);
  float nearest = min(distances.x, min(distances.y, distances.z));
  float opacity = clamp(half_width + 0.5 - nearest, 0.0, 1.0);
  result = 0.85 * opacity * vec4(colour, 1.0);
})";

}  // namespace n3ds::tool
