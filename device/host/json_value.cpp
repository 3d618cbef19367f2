// Prints a value of the JSON text on standard input, for the stories: text as it is, anything else
// as JSON.
//
//   json_value POINTER     a JSON pointer, as /volumes/0/mount_point
//
// Exit status: 0, 1 where the text has no such value, 2 for a wrong command line or for text that
// is not exactly one JSON value.

#include <stdio.h>

#include <exception>
#include <iostream>
#include <nlohmann/json.hpp>
#include <string>

namespace {

int print_value(const char* pointer) {
  const nlohmann::json text = nlohmann::json::parse(std::cin, nullptr, /*allow_exceptions=*/false);
  if (text.is_discarded()) {
    fprintf(stderr, "json_value: this is not JSON\n");
    return 2;
  }
  const nlohmann::json flat = text.flatten();
  const auto found = flat.find(pointer);
  if (found == flat.end()) {
    return 1;
  }
  printf("%s\n", found->is_string() ? found->get<std::string>().c_str() : found->dump().c_str());
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 2) {
    fprintf(stderr, "usage: json_value POINTER\n");
    return 2;
  }
  try {
    return print_value(argv[1]);
  } catch (const std::exception& error) {
    fprintf(stderr, "json_value: %s\n", error.what());
    return 2;
  }
}
