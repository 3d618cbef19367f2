#pragma once

#include <nlohmann/json_fwd.hpp>
#include <string>

#include "cli/table.h"

namespace sentrova {

// Results go to standard output, either as text for people or as one JSON object for programs;
// errors go to standard error as printable text (printable.h) and, for programs, also to standard
// output as {"error": ...}.
class Output {
 public:
  explicit Output(const bool& json) : json_(json) {}

  void result(const std::string& text, const nlohmann::json& object) const;
  // On a terminal the table is shown in columns that fit it, otherwise by lines of cells parted by
  // tabs; nothing where it has no rows.
  void result(const Table& table, const nlohmann::json& object) const;
  // `object` is what else the JSON object holds.
  void error(const std::string& text) const;
  void error(const std::string& text, const nlohmann::json& object) const;
  // What a person should know besides: to standard error.
  void note(const std::string& text) const;
  // Text that is written at once, as it stands, for people only.
  void progress(const std::string& text) const;
  // Whether results are text on a terminal, for a person's eyes.
  bool to_terminal() const;

 private:
  const bool& json_;  // the command line's flag, which is parsed later
};

}  // namespace sentrova
