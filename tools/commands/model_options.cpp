// SPDX-License-Identifier: MIT
#include "commands/model_options.h"

#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <cmath>
#include <cstdlib>

#include "commands/options.h"
#include "mesh/face_tables.h"
#include "support/error.h"

namespace n3ds::tool {
namespace {

constexpr double kLargestIdentity = 8;  // standard deviations; no person comes near
constexpr double kLargestExpression = 2;

struct Setting {
  std::string name;
  double value;
};

Setting ParseSetting(const std::string& option, const std::string& text, double limit) {
  const std::size_t equals = text.find('=');
  if (equals != std::string::npos) {
    const std::string number = text.substr(equals + 1);
    char* end = nullptr;
    const double value = std::strtod(number.c_str(), &end);
    if (!number.empty() && *end == 0 && std::abs(value) <= limit) {
      return {text.substr(0, equals), value};
    }
  }
  const std::string range = std::to_string(static_cast<int>(limit));
  throw UsageError(option + " " + text + ": expected NAME=VALUE with a value from -" + range +
                   " to " + range);
}

std::size_t ParseMode(const std::string& name, const std::string& text) {
  for (std::size_t mode = 1; mode <= kModelIdentities; ++mode) {
    if (name == std::to_string(mode)) return mode - 1;
  }
  throw UsageError("--identity " + text + ": there are modes 1 to " +
                   std::to_string(kModelIdentities));
}

std::size_t ParseExpression(const std::string& name, const std::string& text) {
  try {
    return ExpressionByName(name);
  } catch (const Error& error) {
    throw UsageError("--expression " + text + ": " + error.what());
  }
}

}  // namespace

FaceCoefficients FaceOptions::coefficients() const {
  FaceCoefficients coefficients;
  for (const std::string& text : identity) {
    const Setting setting = ParseSetting("--identity", text, kLargestIdentity);
    coefficients.identity[ParseMode(setting.name, text)] = setting.value;
  }
  for (const std::string& text : expression) {
    const Setting setting = ParseSetting("--expression", text, kLargestExpression);
    coefficients.expression[ParseExpression(setting.name, text)] = setting.value;
  }
  return coefficients;
}

Points FaceOptions::face() const {
  const FaceCoefficients wanted = coefficients();
  return FaceShapes(ReadFaceModelFile(model), identity_unit).Compose(wanted);
}

void AddIdentityUnit(CLI::App& command, double& unit) {
  command
      .add_option(
          "--unit", unit,
          "Standard deviations of the population at identity coefficient 1, which the file\n"
          "does not say")
      ->type_name("N")
      ->check(CLI::Range(0.1, 1000.0).description(""))
      ->capture_default_str();
}

void AddFaceOptions(CLI::App& command, FaceOptions& options) {
  AddFileArgument(command, "MODEL", options.model, "Face-model file");
  command
      .add_option("--identity", options.identity,
                  "Identity mode (1 to 16) and its amount in standard deviations; may be repeated")
      ->allow_extra_args(false)
      ->delimiter(',')
      ->type_name("MODE=AMOUNT");
  command
      .add_option("--expression", options.expression,
                  "Expression by name and its amount, 1 for full intensity; may be repeated")
      ->allow_extra_args(false)
      ->delimiter(',')
      ->type_name("NAME=AMOUNT");
  AddIdentityUnit(command, options.identity_unit);
}

}  // namespace n3ds::tool
