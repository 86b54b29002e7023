#pragma once
// Builds DOM content from XML bytes with expat (namespace processing off, no external entity
// or DTD ever read, expat's amplification limits on, nesting bounded).

#include <memory>
#include <string>
#include <string_view>

#include "DomDocument.h"

namespace kest {
namespace detail {

/// Freshly parsed content: the top-level nodes are the children of `top`, all in `store`.
struct ParsedContent {
    std::unique_ptr<DomStore> store;
    DomNode* top = nullptr;
    bool hasDoctype = false;  // a document type declaration came before the root
};

/// Bytes to parse, delivered in pieces so that a file need not be held in memory whole.
class XmlSource {
  public:
    virtual ~XmlSource() = default;
    /// The next piece (empty at the end); false with `error` set when reading fails.
    virtual bool Next(std::string_view& piece, std::string& error) = 0;
    /// The line of text around byte `offset`, for error reports; empty when unknown.
    virtual std::string LineAround(long offset) = 0;
};

class MemorySource final : public XmlSource {
  public:
    explicit MemorySource(std::string_view bytes) noexcept;
    bool Next(std::string_view& piece, std::string& error) override;
    std::string LineAround(long offset) override;

  private:
    std::string_view m_bytes;
    std::size_t m_offset = 0;
};

class FileSource final : public XmlSource {
  public:
    FileSource() = default;
    ~FileSource() override;
    FileSource(const FileSource&) = delete;
    FileSource& operator=(const FileSource&) = delete;
    /// Opens a file for reading ("-" reads standard input); false with a reason naming the path
    /// and the cause.
    bool Open(const std::string& path, DomError& error);
    /// True for a regular file, which can be read again from its start; false for pipes,
    /// terminals and standard input, whose bytes can be read once only.
    bool Seekable() const noexcept { return m_seekable; }
    bool Next(std::string_view& piece, std::string& error) override;
    std::string LineAround(long offset) override;
    /// Starts reading again from the first byte.
    bool Rewind();
    /// Reads the whole file from its start.
    bool ReadAll(std::string& bytes, std::string& error);

  private:
    int m_fd = -1;
    std::string m_path;
    std::string m_buffer;
    std::size_t m_size = 0;
    bool m_atStart = true;
    bool m_utf16 = false;
    bool m_seekable = false;
};

/// The failure code for an errno value (E_ACCESSDENIED, file/path not found, E_FAIL).
HRESULT HResultForErrno(int err) noexcept;

/// Parses the source. `forcedEncoding` (e.g. "UTF-8") overrides BOM and declaration detection;
/// null lets expat detect the encoding. `url` names the source in error reasons (may be empty).
/// With `rootOnly` parsing stops after the root element's start tag (for a look at its
/// attributes). Without `preserveWhiteSpace`, text of white space alone that stands beside an
/// element (indentation between elements) is dropped; white space in text-only content stays.
/// A reference to an entity that is never read (external, or undeclared beside a DTD that is
/// not read) fails the parse naming the entity, rather than vanishing from the text.
/// Returns the content, or an empty store with `error` filled. Never throws.
ParsedContent ParseXml(XmlSource& source, const char* forcedEncoding, const std::string& url,
                       long maxElementDepth, DomError& error, bool rootOnly = false,
                       bool preserveWhiteSpace = true) noexcept;

/// "<what> at line L, column C in URL" (the " in URL" part when url is not empty).
std::string DescribeLocation(const std::string& what, long line, long column,
                             const std::string& url);

}  // namespace detail
}  // namespace kest
