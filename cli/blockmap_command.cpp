#include "cli/blockmap_command.h"

#include <android-base/file.h>
#include <android-base/logging.h>
#include <android-base/unique_fd.h>
#include <fcntl.h>
#include <openssl/evp.h>
#include <signal.h>
#include <string.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <cstdint>
#include <memory>
#include <nlohmann/json.hpp>
#include <string>

#include "cli/exit_status.h"
#include "cli/file_blocks.h"
#include "otautil/sysutil.h"

namespace sentrova {
namespace {

struct Arguments {
  std::string file;
  std::string map;
  bool check = false;
};

// Writes a new file through to its device; one that exists is not touched. Returns an empty text,
// or why it is not written.
std::string write_new_file(const std::string& path, const std::string& text) {
  const android::base::unique_fd file(
      open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644));
  if (file < 0) {
    return "cannot make " + path + ": " + strerror(errno);
  }
  if (!android::base::WriteStringToFd(text, file.get()) || fsync(file.get()) != 0) {
    const std::string problem = "cannot write " + path + ": " + strerror(errno);
    unlink(path.c_str());
    return problem;
  }
  return "";
}

nlohmann::json describe(const BlockMapData& map) {
  nlohmann::json ranges = nlohmann::json::array();
  for (const auto& [first, end] : map.block_ranges) {
    ranges.push_back({first, end});
  }
  return {{"device", map.device_path},
          {"file_size", map.file_size},
          {"block_size", map.block_size},
          {"ranges", ranges}};
}

ExitStatus write_map(const Arguments& arguments, const Output& output) {
  const FileBlocks blocks = find_file_blocks(arguments.file);
  if (!blocks.error.empty()) {
    output.error(blocks.error);
    return kExitUsage;
  }
  std::string text = block_map_text(blocks.map);
  if (arguments.map.empty()) {
    text.pop_back();  // the line end is the output's
    output.result(text, describe(blocks.map));
    return kExitSuccess;
  }
  const std::string problem = write_new_file(arguments.map, text);
  if (!problem.empty()) {
    output.error(problem);
    return kExitServiceFailed;
  }
  output.result(arguments.map + ": " + std::to_string(blocks.map.block_ranges.size()) +
                    " ranges on " + blocks.map.device_path,
                describe(blocks.map));
  return kExitSuccess;
}

// The lower-case hexadecimal SHA-256 of the memory; empty if the library cannot.
std::string sha256(const unsigned char* data, size_t size) {
  unsigned char digest[EVP_MAX_MD_SIZE];
  unsigned int length = 0;
  std::string text;
  if (EVP_Digest(data, size, digest, &length, EVP_sha256(), nullptr) == 1) {
    for (unsigned int i = 0; i < length; ++i) {
      constexpr char kDigits[] = "0123456789abcdef";
      text += {kDigits[digest[i] >> 4], kDigits[digest[i] & 15]};
    }
  }
  return text;
}

// Memory that the device cannot fill is a signal, after which nothing can go on.
void fail_on_unreadable_data() {
  struct sigaction action = {};
  action.sa_handler = [](int) {
    constexpr char kMessage[] = "sentrova: the device does not give the file's data\n";
    static_cast<void>(!write(STDERR_FILENO, kMessage, sizeof(kMessage) - 1));
    _exit(kExitServiceFailed);
  };
  sigaction(SIGBUS, &action, nullptr);
}

// A log message of bearable length: the library quotes lines of the map, whatever they hold.
std::string quote(const std::string& message) {
  constexpr size_t kMaxLength = 200;
  return message.size() > kMaxLength ? message.substr(0, kMaxLength) + "..." : message;
}

// Maps a file by its map; otherwise `problem` is what the library logs about it.
bool map_file(const std::string& map, MemMapping& mapping, std::string& problem) {
  android::base::SetLogger([&problem](auto, auto severity, auto, auto, auto, const char* text) {
    if (severity >= android::base::ERROR) {
      problem += (problem.empty() ? "" : "; ") + quote(text);
    }
  });
  const bool is_mapped = mapping.MapBlockFile(map);
  android::base::SetLogger(android::base::StderrLogger);
  return is_mapped;
}

ExitStatus check_map(const Arguments& arguments, const Output& output) {
  MemMapping mapping;
  std::string problem;
  if (!map_file(arguments.file, mapping, problem)) {
    output.error("no usable map: " + arguments.file + ": " + problem);
    return kExitUsage;
  }
  fail_on_unreadable_data();
  const std::string digest = sha256(mapping.addr, mapping.length);
  if (digest.empty()) {
    output.error("the digest cannot be computed");
    return kExitServiceFailed;
  }
  output.result(std::to_string(mapping.length) + " bytes in " + std::to_string(mapping.ranges()) +
                    " ranges\nsha256 " + digest,
                {{"file_size", mapping.length}, {"ranges", mapping.ranges()}, {"sha256", digest}});
  return kExitSuccess;
}

}  // namespace

void add_blockmap_command(CLI::App& app, const Output& output, int& status) {
  CLI::App* const command =
      app.add_subcommand("blockmap", "Write the block map of a file, or read a file through one");
  // Shared with the callback, which outlives this function.
  const auto arguments = std::make_shared<Arguments>();
  command->add_option("file", arguments->file, "The file, or with --check a map")->required();
  CLI::Option* const map_option = command->add_option(
      "-o,--output", arguments->map, "Write the map to this new file, not to standard output");
  command
      ->add_flag("--check", arguments->check,
                 "Read the file off its device and show its size and digest")
      ->excludes(map_option);
  command->callback([arguments, &output, &status] {
    status = arguments->check ? check_map(*arguments, output) : write_map(*arguments, output);
  });
}

}  // namespace sentrova
