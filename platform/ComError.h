#pragma once
// _com_error: the exception that carries a failing HRESULT out of the platform layer.

#include <exception>
#include <string>

#include "Export.h"
#include "HResult.h"

namespace kest {

class KEST_API _com_error : public std::exception {
  public:
    /// An error for the given failure code, with an optional description.
    explicit _com_error(HRESULT hr, std::string description = std::string());
    /// The failure code.
    HRESULT Error() const noexcept { return m_hr; }
    /// A text naming the code, e.g. "E_POINTER (0x80004003)", plus the description if any.
    const char* ErrorMessage() const noexcept { return m_message.c_str(); }
    /// The description given at construction (may be empty).
    const std::string& Description() const noexcept { return m_description; }
    const char* what() const noexcept override { return m_message.c_str(); }

  private:
    HRESULT m_hr;
    std::string m_description;
    std::string m_message;
};

/// Throws _com_error(hr) when hr is a failure code.
inline void ThrowIfFailed(HRESULT hr) {
    if (FAILED(hr)) throw _com_error(hr);
}
/// Text such as "E_OUTOFMEMORY (0x8007000E)" for a code.
KEST_API std::string HResultName(HRESULT hr);

}  // namespace kest
