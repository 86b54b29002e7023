#pragma once
// CAtlException: thrown when a CComBSTR cannot allocate its string.

#include <exception>

#include "Export.h"
#include "HResult.h"

namespace kest {

class KEST_API CAtlException : public std::exception {
  public:
    explicit CAtlException(HRESULT hr) noexcept : m_hr(hr) {}
    operator HRESULT() const noexcept { return m_hr; }
    HRESULT m_hr;
    const char* what() const noexcept override { return "CAtlException"; }
};

}  // namespace kest
