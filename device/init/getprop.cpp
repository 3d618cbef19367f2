// getprop NAME [DEFAULT]: prints the value of a property of the device.

#include <android-base/properties.h>

#include <cstdio>

int main(int argc, char** argv) {
  if (argc < 2 || argc > 3) {
    fprintf(stderr, "usage: getprop NAME [DEFAULT]\n");
    return 2;
  }
  printf("%s\n", android::base::GetProperty(argv[1], argc > 2 ? argv[2] : "").c_str());
  return 0;
}
