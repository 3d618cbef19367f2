#include "cli/holders_command.h"

#include <android-base/file.h>

#include <nlohmann/json.hpp>

#include "cli/holders.h"
#include "cli/volume_table.h"

namespace sentrova {
namespace {

// A path that does not exist may still be held.
std::string real_path(const std::string& path) {
  std::string result;
  return android::base::Realpath(path, &result) ? result : table_path(path);
}

nlohmann::json describe(const Holder& holder) {
  nlohmann::json held = nlohmann::json::array();
  for (const HeldPath& one : holder.held) {
    nlohmann::json& object = held.emplace_back();
    object = {{"by", one.by}, {"path", one.path}};
    if (one.descriptor >= 0) {
      object["descriptor"] = one.descriptor;
    }
  }
  return {{"pid", holder.pid}, {"name", holder.name}, {"holds", held}};
}

}  // namespace

ExitStatus show_holders(const std::string& path, const Output& output) {
  const std::string real = real_path(path);
  if (real.empty()) {
    output.error("there is no such path: " + path);
    return kExitUsage;
  }
  const HolderSearch search = find_holders(real);
  Table table({"PID", "PROCESS", "BY", "PATH"});
  nlohmann::json holders = nlohmann::json::array();
  for (const Holder& holder : search.holders) {
    holders.push_back(describe(holder));
    for (const HeldPath& held : holder.held) {
      table.add_row(
          {std::to_string(holder.pid), holder.name,
           held.descriptor < 0 ? held.by : held.by + " " + std::to_string(held.descriptor),
           held.path});
    }
  }
  const nlohmann::json object = {
      {"path", real}, {"holders", holders}, {"unreadable_processes", search.unreadable}};
  if (search.unreadable > 0) {
    output.note(std::to_string(search.unreadable) +
                " processes cannot be looked into; root can do so");
  }
  if (search.holders.empty()) {
    output.note("nothing that can be seen holds " + real);
  }
  output.result(table, object);
  return search.holders.empty() ? kExitAnswerIsNo : kExitSuccess;
}

}  // namespace sentrova
