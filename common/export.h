#pragma once

// Marks what a library of this project exports; everything else stays inside it.
#define SENTROVA_API __attribute__((visibility("default")))
