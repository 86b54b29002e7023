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

/// CPU time of the whole process (user and system), in seconds. On a machine shared with
/// other work it is steadier than wall time; the library starts no threads of its own.
double ProcessCpuSeconds();

/// Wall and CPU time of one measured piece.
struct Lap {
    double wall = 0;
    double cpu = 0;
};

class Stopwatch {
  public:
    Stopwatch() : m_wall(std::chrono::steady_clock::now()), m_cpu(ProcessCpuSeconds()) {}
    Lap Stop() const { return Lap{SecondsSince(m_wall), ProcessCpuSeconds() - m_cpu}; }

  private:
    std::chrono::steady_clock::time_point m_wall;
    double m_cpu;
};

}  // namespace bench
}  // namespace kest
