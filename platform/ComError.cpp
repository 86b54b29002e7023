#include "ComError.h"

#include <cstdio>

namespace kest {

namespace {

struct NamedCode {
    HRESULT code;
    const char* name;
};

constexpr NamedCode kNames[] = {
    {S_OK, "S_OK"},
    {S_FALSE, "S_FALSE"},
    {E_NOTIMPL, "E_NOTIMPL"},
    {E_NOINTERFACE, "E_NOINTERFACE"},
    {E_POINTER, "E_POINTER"},
    {E_FAIL, "E_FAIL"},
    {E_UNEXPECTED, "E_UNEXPECTED"},
    {E_ACCESSDENIED, "E_ACCESSDENIED"},
    {E_OUTOFMEMORY, "E_OUTOFMEMORY"},
    {E_INVALIDARG, "E_INVALIDARG"},
    {DISP_E_TYPEMISMATCH, "DISP_E_TYPEMISMATCH"},
    {DISP_E_OVERFLOW, "DISP_E_OVERFLOW"},
    {DISP_E_BADINDEX, "DISP_E_BADINDEX"},
    {DISP_E_BADVARTYPE, "DISP_E_BADVARTYPE"},
    {DISP_E_ARRAYISLOCKED, "DISP_E_ARRAYISLOCKED"},
    {REGDB_E_CLASSNOTREG, "REGDB_E_CLASSNOTREG"},
    {CO_E_CLASSSTRING, "CO_E_CLASSSTRING"},
    {XML_E_PARSEFAILED, "XML_E_PARSEFAILED"},
    {XML_E_INVALID, "XML_E_INVALID"},
};

std::string BuildMessage(HRESULT hr, const std::string& description) {
    std::string message = HResultName(hr);
    if (!description.empty()) {
        message += ": ";
        message += description;
    }
    return message;
}

}  // namespace

_com_error::_com_error(HRESULT hr, std::string description)
    : m_hr(hr), m_description(std::move(description)), m_message(BuildMessage(hr, m_description)) {}

std::string HResultName(HRESULT hr) {
    char hex[16];
    std::snprintf(hex, sizeof hex, "0x%08X", static_cast<unsigned>(hr));
    for (const NamedCode& named : kNames) {
        if (named.code == hr) return std::string(named.name) + " (" + hex + ")";
    }
    return std::string("HRESULT ") + hex;
}

}  // namespace kest
