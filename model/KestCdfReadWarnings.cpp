#include "KestCdfReadWarnings.h"

namespace kest {
namespace detail {

namespace {
thread_local ReadWarningScope* t_current = nullptr;
}  // namespace

ReadWarningScope::ReadWarningScope() noexcept : m_outer(t_current) { t_current = this; }

ReadWarningScope::~ReadWarningScope() { t_current = m_outer; }

ReadWarningScope* ReadWarningScope::Current() noexcept { return t_current; }

void ReadWarningScope::SetText(const char* text, long line, long column) noexcept {
    m_text = text;
    m_line = line;
    m_column = column;
}

void ReadWarningScope::Add(const char* first, const char* last, std::string_view valueRead,
                           const char* kind) {
    if (m_entries.size() >= kKept) {
        ++m_omitted;
        return;
    }
    ReadWarningEntry entry;
    entry.line = m_line;
    entry.column = m_column;
    // The token's position: the text's start moved over the bytes before the token.
    if (m_line > 0 && m_text && m_text <= first) {
        for (const char* p = m_text; p != first; ++p) {
            if (*p == '\n') {
                ++entry.line;
                entry.column = 1;
            } else if ((static_cast<unsigned char>(*p) & 0xC0) != 0x80) {
                ++entry.column;  // one column per character, not per UTF-8 byte
            }
        }
    }
    entry.item = m_item;
    entry.token.assign(first, last);
    entry.valueRead.assign(valueRead.data(), valueRead.size());
    entry.kind = kind;
    m_entries.push_back(std::move(entry));
}

}  // namespace detail
}  // namespace kest
