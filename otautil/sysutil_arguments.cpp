#include "otautil/sysutil.h"

std::vector<char*> StringVectorToNullTerminatedArray(const std::vector<std::string>& arguments) {
  std::vector<char*> array;
  array.reserve(arguments.size() + 1);
  for (const std::string& argument : arguments) {
    // The exec functions take pointers to non-const characters and do not change them.
    array.push_back(const_cast<char*>(argument.c_str()));
  }
  array.push_back(nullptr);
  return array;
}
