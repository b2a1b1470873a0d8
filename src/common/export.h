#pragma once

// Marks the classes and functions that host programs use.
#if defined(__GNUC__)
#define HARNESS_EXPORT __attribute__((visibility("default")))
#else
#define HARNESS_EXPORT
#endif
