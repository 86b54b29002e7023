#include "KestCdfSymbolicFile.h"

#include "KestCdfDomWriting.h"

#include <climits>
#include <cstdint>
#include <cstring>

#include "../platform/KestCalmorphDLLError.h"

namespace kest {
namespace {

bool IsBlank(char c) {
    return c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' || c == '\r';
}

int HexDigitValue(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return -1;
}

// The int with the same 32 bits, without relying on implementation-defined narrowing.
int FromBits(std::uint32_t bits) {
    if (bits <= static_cast<std::uint32_t>(INT_MAX)) return static_cast<int>(bits);
    return static_cast<int>(bits - 0x80000000u) + INT_MIN;
}

}  // namespace

int KestCdfSymbolicFile::atohd(const char* text) {
    if (!text) return 0;
    const bool hexadecimal = std::strchr(text, 'x') != nullptr;
    const char* p = text;
    while (IsBlank(*p)) ++p;
    bool negative = false;
    if (*p == '+' || *p == '-') {
        negative = *p == '-';
        ++p;
    }
    if (hexadecimal) {
        // The reading of strtoul with base 16 on a 32-bit unsigned long.
        if (p[0] == '0' && (p[1] == 'x' || p[1] == 'X') && HexDigitValue(p[2]) >= 0) p += 2;
        std::uint64_t value = 0;
        for (int digit; (digit = HexDigitValue(*p)) >= 0; ++p) {
            value = value * 16 + static_cast<unsigned>(digit);
            if (value > 0xFFFFFFFFu) return FromBits(0xFFFFFFFFu);
        }
        std::uint32_t bits = static_cast<std::uint32_t>(value);
        if (negative) bits = 0u - bits;
        return FromBits(bits);
    }
    // Decimal: a 32-bit strtol, saturating at the ends of the int range.
    std::int64_t value = 0;
    for (; *p >= '0' && *p <= '9'; ++p) {
        value = value * 10 + (*p - '0');
        if (value > static_cast<std::int64_t>(INT_MAX) + 1) {
            value = static_cast<std::int64_t>(INT_MAX) + 1;
        }
    }
    if (negative) value = -value;
    if (value > INT_MAX) return INT_MAX;
    if (value < INT_MIN) return INT_MIN;
    return static_cast<int>(value);
}

void KestCdfSymbolicFile::hdtoa(unsigned int value, char* buffer) {
    if (!buffer) return;
    // Digits fill positions 9 down to 2 of "0x00000000"; the prefix and leading zeros stay.
    for (int position = 9; value != 0 && position >= 2; --position) {
        unsigned int digit = value & 0xFu;
        buffer[position] = static_cast<char>(digit < 10 ? '0' + digit : 'A' + (digit - 10));
        value >>= 4;
    }
}

_bstr_t KestCdfSymbolicFile::GetNodeString(IXMLDOMNodePtr node) {
    if (!node || node->GetnodeType() != NODE_ATTRIBUTE) {
        KestCalmorphDLLError::Raise(reason::kSymbolicFileAttribute);
    }
    return _bstr_t(node->GetnodeValue());
}

int KestCdfSymbolicFile::GetNodeValue(IXMLDOMNodePtr node) {
    if (!node || node->GetnodeType() != NODE_ATTRIBUTE) {
        KestCalmorphDLLError::Raise(reason::kSymbolicFileAttribute);
    }
    _bstr_t text(node->GetnodeValue());
    return atohd(static_cast<const char*>(text));
}

void KestCdfSymbolicFile::SetSymbolicFileAttributes(IXMLDOMNamedNodeMapPtr attributes) {
    if (!attributes) return;
    m_crc = GetNodeValue(attributes->nextNode());
}

bool KestCdfSymbolicFile::ConvertSymbolicFileNode(IXMLDOMNodePtr node) {
    SetSymbolicFileAttributes(node->Getattributes());
    IXMLDOMNodeListPtr children = node->GetchildNodes();
    if (!children) return true;
    while (IXMLDOMNodePtr child = children->nextNode()) {
        m_fileName.m_string = CComBSTR(_bstr_t(child->GetnodeValue()).View());
    }
    return true;
}

bool KestCdfSymbolicFile::ConvertSymbolicFileNodeToXML(IXMLDOMNodePtr parent, IXMLDOMDocument* doc,
                                                       KestCdfNormalizedString ns) {
    char buffer[11] = "0x00000000";
    hdtoa(static_cast<unsigned int>(m_crc), buffer);
    return detail::AppendFileReference(parent, doc, u"SYMBOLIC-FILE",
                                       _bstr_t(ns.m_string.m_str, true), m_fileName.m_string.m_str,
                                       buffer);
}

}  // namespace kest
