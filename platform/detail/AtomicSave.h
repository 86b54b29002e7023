#pragma once
// Saving a document to a file so that the file is always either the old or the new content.
// Private to the platform layer.

#include <string>

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

}  // namespace detail
}  // namespace kest
