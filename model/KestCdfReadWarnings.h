#pragma once
// Shared by the value list readers and the converter that hands the warnings to the host; not
// installed.
// Tokens of value lists that the reader took only in part, empty tokens and overflows, gathered
// per read for the host: the numbers are still read by the atoi and atof rules, but a number
// that silently changed is worth a word.

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace kest {
namespace detail {

/// One token the reader did not take whole.
struct ReadWarningEntry {
    long line = 0;          ///< 1-based; 0 when unknown
    long column = 0;        ///< 1-based; 0 when unknown
    std::string item;       ///< item name read so far
    std::string token;      ///< as written
    std::string valueRead;  ///< the number the reader took, as the writer would write it
    const char* kind = "";  ///< "partial", "empty", "overflow"
};

/// Collects the warnings of the readers on this thread while it lives (scopes nest; the
/// innermost collects). Readers without a scope record nothing and pay one thread-local load.
class ReadWarningScope {
  public:
    static constexpr std::size_t kKept = 1000;

    ReadWarningScope() noexcept;
    ~ReadWarningScope();
    ReadWarningScope(const ReadWarningScope&) = delete;
    ReadWarningScope& operator=(const ReadWarningScope&) = delete;

    /// The scope collecting on this thread, or null.
    static ReadWarningScope* Current() noexcept;

    /// The item whose children are read now.
    void SetItem(std::string_view name) { m_item.assign(name.data(), name.size()); }
    /// The text whose tokens are read now, with its start position (0, 0 when unknown).
    void SetText(const char* text, long line, long column) noexcept;
    /// Records a token of the current text.
    void Add(const char* first, const char* last, std::string_view valueRead, const char* kind);

    const std::vector<ReadWarningEntry>& Entries() const noexcept { return m_entries; }
    std::size_t Omitted() const noexcept { return m_omitted; }

  private:
    ReadWarningScope* m_outer;
    std::vector<ReadWarningEntry> m_entries;
    std::size_t m_omitted = 0;
    std::string m_item;
    const char* m_text = nullptr;
    long m_line = 0;
    long m_column = 0;
};

}  // namespace detail
}  // namespace kest
