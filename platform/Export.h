#pragma once
// KEST_API marks the classes and functions that hosts may use. The library is built with hidden
// visibility, so everything without the mark (the private detail/ units above all) stays inside
// it and cannot clash with a host's own symbols.

#if defined(__GNUC__)
#define KEST_API __attribute__((visibility("default")))
#else
#define KEST_API
#endif
