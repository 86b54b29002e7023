#include "DomNames.h"

#include <utility>
#include <vector>

namespace kest {
namespace detail {

namespace {
bool IsBlank(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }
}  // namespace

bool IsUtf8EncodingName(std::string_view name) noexcept {
    constexpr std::string_view kDashed = "utf-8";
    constexpr std::string_view kPlain = "utf8";
    if (name.size() != kDashed.size() && name.size() != kPlain.size()) return false;
    const std::string_view expected = name.size() == kDashed.size() ? kDashed : kPlain;
    for (std::size_t i = 0; i < name.size(); ++i) {
        char c = name[i] >= 'A' && name[i] <= 'Z' ? static_cast<char>(name[i] + 32) : name[i];
        if (c != expected[i]) return false;
    }
    return true;
}

bool IsXmlName(std::string_view name) noexcept {
    if (name.empty()) return false;
    unsigned char first = static_cast<unsigned char>(name[0]);
    if ((first >= '0' && first <= '9') || first == '-' || first == '.' || first == ':')
        return false;
    for (char ch : name) {
        unsigned char c = static_cast<unsigned char>(ch);
        if (c >= 0x80) continue;
        bool ok = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
                  c == '_' || c == '-' || c == '.' || c == ':';
        if (!ok) return false;
    }
    return name.back() != ':';
}

std::string DeclarationText(const DomNode* declaration) {
    std::string text;
    for (const DomNode* a = declaration->FirstAttribute(); a; a = a->next) {
        if (!text.empty()) text += ' ';
        text += a->Name();
        text += "=\"";
        text += a->Text();
        text += '"';
    }
    return text;
}

void SetDeclarationText(DomDocument& document, DomNode* declaration, std::string_view text) {
    std::vector<std::pair<std::string_view, std::string_view>> pairs;
    std::size_t i = 0;
    auto fail = [&]() {
        throw _com_error(E_FAIL,
                         "not a list of XML declaration pseudo-attributes: " + std::string(text));
    };
    for (;;) {
        while (i < text.size() && IsBlank(text[i])) ++i;
        if (i == text.size()) break;
        std::size_t nameStart = i;
        while (i < text.size() && !IsBlank(text[i]) && text[i] != '=') ++i;
        std::string_view name = text.substr(nameStart, i - nameStart);
        while (i < text.size() && IsBlank(text[i])) ++i;
        if (!IsXmlName(name) || i == text.size() || text[i] != '=') fail();
        ++i;
        while (i < text.size() && IsBlank(text[i])) ++i;
        if (i == text.size() || (text[i] != '"' && text[i] != '\'')) fail();
        char quote = text[i++];
        std::size_t end = text.find(quote, i);
        if (end == std::string_view::npos) fail();
        pairs.emplace_back(name, text.substr(i, end - i));
        i = end + 1;
    }
    while (DomNode* a = declaration->FirstAttribute()) Unlink(a);
    for (const auto& p : pairs) {
        DomNode* a = document.NewNode(NODE_ATTRIBUTE, document.Intern(NODE_ATTRIBUTE, p.first));
        document.SetText(a, p.second);
        LinkAttribute(declaration, a);
    }
    ++document.generation;
}

}  // namespace detail
}  // namespace kest
