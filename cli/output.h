#pragma once

#include <nlohmann/json_fwd.hpp>
#include <string>

namespace sentrova {

// Results go to standard output, either as text for people or as one JSON object for programs;
// errors go to standard error as text and, for programs, also to standard output as {"error": ...}.
class Output {
 public:
  explicit Output(const bool& json) : json_(json) {}

  void result(const std::string& text, const nlohmann::json& object) const;
  // `object` is what else the JSON object holds.
  void error(const std::string& text) const;
  void error(const std::string& text, const nlohmann::json& object) const;
  // Text that is written at once, as it stands, for people only.
  void progress(const std::string& text) const;

 private:
  const bool& json_;  // the command line's flag, which is parsed later
};

}  // namespace sentrova
