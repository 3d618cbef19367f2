// setprop NAME VALUE: sets a property of the device.

#include <android-base/properties.h>

#include <cstdio>

int main(int argc, char** argv) {
  if (argc != 3) {
    fprintf(stderr, "usage: setprop NAME VALUE\n");
    return 2;
  }
  if (!android::base::SetProperty(argv[1], argv[2])) {
    perror("setprop");
    return 1;
  }
  return 0;
}
