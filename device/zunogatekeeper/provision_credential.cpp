#include <unistd.h>

#include "device/zunogatekeeper/provision.h"

int main(int argc, char** argv) {
  return sentrova::provision(argc, argv, STDIN_FILENO);
}
