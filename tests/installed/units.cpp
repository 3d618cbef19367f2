// Uses the units of an installed tree that do no harm to the machine a little, and fails where the
// pieces do not fit together:
//   ANDROID_PROPERTY_DIR=FOLDER units FOLDER

#include <android-base/properties.h>

#include <cstdio>
#include <fstream>
#include <string>

#include "otautil/rangeset.h"
#include "otautil/sysutil.h"
#include "recovery_utils/mounts_ex.h"
#include "recovery_utils/roots.h"
#include "service/sentrova_service.h"
#include "toolkit/zuno_func.h"
#include "toolkitutil/findfile.h"

namespace {

int failures = 0;

void check(const char* what, bool ok) {
  if (!ok) {
    fprintf(stderr, "units: %s\n", what);
    ++failures;
  }
}

}  // namespace

int main(int, char** argv) {
  const std::string folder = argv[1];

  // Only where the shared store stands before libbase's own does a property become a file.
  check("a property is set", android::base::SetProperty("test.unit", "here"));
  std::string value;
  std::ifstream(folder + "/test.unit") >> value;
  check("it is in the store that processes share", value == "here");

  const RangeSet ranges = RangeSet::Parse("4,1,3,7,9");
  check("block ranges", ranges && ranges.blocks() == 4);
  check("arguments", StringVectorToNullTerminatedArray({"a", "b"}).size() == 3);
  check("no volume in a table that is not loaded", volume_for_mount_point("/data") == nullptr);
  check("the kernel's table of mounts", scan_mounted_volumes());
  check("a file is there", ZunoFunc::Path_Exists(folder + "/test.unit"));
  check("and found", Find_File::Find("test.unit", folder) == folder + "/test.unit");

  // The service object is local, so a client's view of it is the object itself.
  const android::sp<android::SentrovaService> service = new android::SentrovaService();
  check("the service is its own interface",
        android::ISentrovaService::asInterface(service.get()) == service.get());
  check("its descriptor",
        service->getInterfaceDescriptor() == android::ISentrovaService::descriptor);
  return failures == 0 ? 0 : 1;
}
