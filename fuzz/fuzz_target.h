#pragma once

#include <stddef.h>
#include <stdint.h>

// The entry points that libFuzzer calls: the first once at the start (quiet_log.cpp), the second
// for every input. An input that breaks what a target expects aborts the program.
extern "C" int LLVMFuzzerInitialize(int* argc, char*** argv);
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);
