#include "Value.h"

#include <charconv>
#include <cmath>
#include <cstring>
#include <utility>

namespace kest {
namespace ops {

Value Value::Integer(std::int32_t value) {
    Value v;
    v.m_kind = Kind::kInteger;
    v.m_number = value;
    return v;
}

Value Value::Double(double value) {
    Value v;
    v.m_kind = Kind::kDouble;
    v.m_number = value;
    return v;
}

Value Value::String(std::string text) {
    Value v;
    v.m_kind = Kind::kString;
    v.m_text = std::move(text);
    return v;
}

std::int32_t Value::Integer() const noexcept {
    if (!IsNumber() || std::isnan(m_number)) return 0;
    if (m_number >= 2147483647.0) return 2147483647;
    if (m_number <= -2147483648.0) return -2147483647 - 1;
    return static_cast<std::int32_t>(m_number);
}

std::string Value::ToText() const {
    switch (m_kind) {
        case Kind::kInteger:
        case Kind::kDouble:
            return FormatNumber(m_number);
        case Kind::kString:
            return m_text;
        case Kind::kEmpty:
            break;
    }
    return std::string();
}

bool Value::SameAs(const Value& other) const noexcept {
    if (IsNumber() && other.IsNumber())
        return m_number == other.m_number || (std::isnan(m_number) && std::isnan(other.m_number));
    if (m_kind != other.m_kind) return false;
    return m_kind != Kind::kString || m_text == other.m_text;
}

bool Value::operator==(const Value& other) const noexcept {
    if (m_kind != other.m_kind) return false;
    if (m_kind == Kind::kString) return m_text == other.m_text;
    return std::memcmp(&m_number, &other.m_number, sizeof m_number) == 0 ||
           (std::isnan(m_number) && std::isnan(other.m_number));
}

std::string FormatNumber(double value) {
    if (std::isnan(value)) return "nan";
    if (std::isinf(value)) return value < 0 ? "-inf" : "inf";
    char buffer[32];
    const auto result = std::to_chars(buffer, buffer + sizeof buffer, value);
    return std::string(buffer, result.ptr);
}

}  // namespace ops
}  // namespace kest
