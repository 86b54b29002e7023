#pragma once
// Helpers shared by the benchmark programs: the bare expat pass that every figure is compared
// with, file sizes and clocks.

#include <chrono>
#include <cstdint>
#include <string>

namespace kest {
namespace bench {

/// Result of one bare expat pass, so that the work cannot be optimised away.
struct ExpatPassResult {
    bool ok = false;
    std::uint64_t elements = 0;
    std::uint64_t attributes = 0;
    std::uint64_t characters = 0;
    std::string error;
};

/// Reads the whole file into memory and parses it with expat (namespace processing off, as the
/// DOM parses), with handlers that only count elements, attributes and character data.
ExpatPassResult ExpatPass(const std::string& path);

/// Size of a file in bytes; 0 when it cannot be read.
std::uint64_t FileSize(const std::string& path);

/// Copies a file; throws std::runtime_error on failure.
void CopyFile(const std::string& from, const std::string& to);

inline double SecondsSince(std::chrono::steady_clock::time_point start) {
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

}  // namespace bench
}  // namespace kest
