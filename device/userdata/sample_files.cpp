#include "device/userdata/sample_files.h"

#include <sys/stat.h>

#include "device/userdata/photograph.h"
#include "device/zunofscrypt/key_file.h"

namespace sentrova {
namespace {

bool write(const std::string& path, const std::string& text, std::string& error) {
  return replace_file(path, text.data(), text.size(), error);
}

}  // namespace

bool write_sample_files(const Places& places, const std::string& digest_file, std::string& error) {
  const std::string photograph = make_photograph();
  const std::string path = places.data + kPhotographFile;
  mkdir((places.data + "/media/0/DCIM").c_str(), 0755);  // what is wrong shows when it is used
  return write(path, photograph, error) &&
         write(digest_file, sha256_text(photograph) + "  " + path + "\n", error) &&
         write(places.data + kMessagesFile, "Dinner at seven?\n", error) &&
         write(places.data + kAlarmsFile, "06:45 every day\n", error);
}

}  // namespace sentrova
