#pragma once
// Saving a document to a file so that the file is always either the old or the new content.
// Private to the platform layer.

#include <string>
#include <string_view>

#include "DomDocument.h"

namespace kest {
namespace detail {

/// Replaces `path` with the document's text. The text goes to a temporary file beside the
/// target, named ".<name>.<pid>.tmp-XXXXXX" after the writing process; it is synced, renamed
/// over the target, and the directory is synced. A failure removes the temporary file and
/// leaves the target as it was, throwing _com_error with the path and the system's reason.
///
/// A process killed while it saves leaves the target intact and possibly its temporary file;
/// the next save of the same target removes temporary files of processes that have ended
/// (never one of a process that is still running). After a power cut the target holds the old
/// or the new content in full once the save has returned; a save cut short may leave the old
/// content and a temporary file, which the next save removes.
void SaveAtomically(const DomNode* document, const std::string& path, bool indent = false);

/// The file of one such save, written in pieces. A failure while opening or writing is kept
/// and the pieces after it are dropped, so that whoever produces the text can finish its own
/// checks first; Commit throws the first failure kept. Destroyed without a successful Commit,
/// the temporary file is removed and the target stays as it was.
class AtomicFile {
  public:
    /// Nothing is touched until the first piece (or Commit).
    explicit AtomicFile(std::string path);
    ~AtomicFile();
    AtomicFile(const AtomicFile&) = delete;
    AtomicFile& operator=(const AtomicFile&) = delete;

    void Write(std::string_view piece) noexcept;
    /// Throws the first failure kept; else refuses a text holding `unrepresentable` (>= 0), a
    /// character XML 1.0 cannot carry; else syncs the file and renames it over the target.
    void Commit(long unrepresentable);

  private:
    void Open();
    void Keep(int err, const char* what) noexcept;

    std::string m_path;
    std::string m_target;
    std::string m_dir;
    std::string m_temp;
    int m_fd = -1;
    unsigned m_mode = 0;
    bool m_opened = false;
    bool m_committed = false;
    int m_error = 0;
    std::string m_what;
};

}  // namespace detail
}  // namespace kest
