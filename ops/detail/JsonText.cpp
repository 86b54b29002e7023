#include "JsonText.h"

#include <cstdio>

namespace kest {
namespace ops {
namespace detail {

void AppendJsonString(std::string& out, std::string_view text, bool forScript) {
    out += '"';
    // Plain runs are copied whole; only the characters JSON (or a script element) cannot hold
    // as they are break a run.
    std::size_t run = 0;
    for (std::size_t i = 0; i < text.size(); ++i) {
        const unsigned char c = static_cast<unsigned char>(text[i]);
        if (c >= 0x20 && c != '"' && c != '\\' && !(forScript && c == '<')) continue;
        out.append(text.data() + run, i - run);
        run = i + 1;
        switch (c) {
            case '"':
                out += "\\\"";
                break;
            case '\\':
                out += "\\\\";
                break;
            case '\n':
                out += "\\n";
                break;
            case '\r':
                out += "\\r";
                break;
            case '\t':
                out += "\\t";
                break;
            default: {
                char escape[8];
                std::snprintf(escape, sizeof escape, "\\u%04x", c);
                out += escape;
            }
        }
    }
    out.append(text.data() + run, text.size() - run);
    out += '"';
}

}  // namespace detail
}  // namespace ops
}  // namespace kest
