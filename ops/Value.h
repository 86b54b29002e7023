#pragma once
// kest::ops::Value: one element of a value list or of an axis, as plain C++: empty, an integer,
// a double or a text. Numbers compare and print by value: the integer 3 and the double 3.0 are
// the same number and both print as "3".

#include <cstdint>
#include <string>

#include "../platform/Export.h"

namespace kest {
namespace ops {

class KEST_API Value {
  public:
    enum class Kind : std::uint8_t { kEmpty, kInteger, kDouble, kString };

    /// An empty element (a token the reader found nothing in).
    Value() = default;
    static Value Integer(std::int32_t value);
    static Value Double(double value);
    static Value String(std::string text);

    Kind GetKind() const noexcept { return m_kind; }
    bool IsNumber() const noexcept { return m_kind == Kind::kInteger || m_kind == Kind::kDouble; }
    /// The number of an integer or a double; 0 for other kinds.
    double Number() const noexcept { return m_number; }
    /// The integer of an integer element; the double truncated otherwise (0 for texts).
    std::int32_t Integer() const noexcept;
    /// The text of a string element; empty for other kinds.
    const std::string& Text() const noexcept { return m_text; }

    /// The element as a reader sees it: numbers by value (FormatNumber), texts as they are, an
    /// empty element as "".
    std::string ToText() const;

    /// Same element by value: two numbers of equal value (integer or double; NaN equals NaN,
    /// -0 equals 0), two identical texts, or two empty elements.
    bool SameAs(const Value& other) const noexcept;

    /// Exact identity: same kind, same bits of a double (-0 differs from 0), same text.
    bool operator==(const Value& other) const noexcept;
    bool operator!=(const Value& other) const noexcept { return !(*this == other); }

  private:
    Kind m_kind = Kind::kEmpty;
    double m_number = 0.0;
    std::string m_text;
};

/// The shortest text that reads back as the same double, without a trailing ".0": 3, 2.5,
/// 1e+20, -0, inf, -inf, nan.
KEST_API std::string FormatNumber(double value);

}  // namespace ops
}  // namespace kest
