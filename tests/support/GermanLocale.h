#pragma once
// Switches the process to a German locale (',' as decimal separator) for the lifetime of the
// object, building de_DE.UTF-8 with localedef into a private folder when the machine has none.
// Restores the previous locale and removes the folder at the end.

#include <unistd.h>

#include <clocale>
#include <cstdlib>
#include <string>

#include <gtest/gtest.h>

namespace kest {
namespace test {

class GermanLocale {
  public:
    GermanLocale() : m_previous(std::setlocale(LC_ALL, nullptr)) {
        if (!std::setlocale(LC_ALL, kName)) {
            // One folder per process: test runs in parallel must not write the same files.
            m_dir = ::testing::TempDir() + "kest-locales-" + std::to_string(getpid());
            const std::string command = "mkdir -p '" + m_dir +
                                        "' && localedef -i de_DE -f UTF-8 '" + m_dir + "/" + kName +
                                        "' >/dev/null 2>&1";
            if (std::system(command.c_str()) == 0) {
                setenv("LOCPATH", m_dir.c_str(), 1);
                std::setlocale(LC_ALL, kName);
            }
        }
    }
    ~GermanLocale() {
        Restore();
        if (!m_dir.empty()) static_cast<void>(std::system(("rm -rf '" + m_dir + "'").c_str()));
    }
    GermanLocale(const GermanLocale&) = delete;
    GermanLocale& operator=(const GermanLocale&) = delete;

    /// True when the German locale is in force.
    bool Active() const { return std::string(std::setlocale(LC_ALL, nullptr)) == kName; }
    /// Back to the locale in force before.
    void Restore() { std::setlocale(LC_ALL, m_previous.c_str()); }

  private:
    static constexpr const char* kName = "de_DE.UTF-8";
    std::string m_previous;
    std::string m_dir;
};

}  // namespace test
}  // namespace kest
