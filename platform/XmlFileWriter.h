#pragma once
// XmlFileWriter: writes an XML file element by element, without a document in memory, with the
// bytes IXMLDOMDocument::save gives for the same content, saved the same way (temporary file,
// sync, rename). For writers that hold their content elsewhere: an element's attributes are
// given before its children, except where a start tag is held (see HoldStartTag).

#include <memory>
#include <string>
#include <string_view>

#include "Export.h"

namespace kest {

class KEST_API XmlFileWriter {
  public:
    /// Starts the document with the XML declaration. An empty `path` writes nowhere (Commit
    /// then fails as a save to an empty path does). With `indent`, the layout of an indented
    /// save.
    XmlFileWriter(std::string path, bool indent);
    ~XmlFileWriter();
    XmlFileWriter(const XmlFileWriter&) = delete;
    XmlFileWriter& operator=(const XmlFileWriter&) = delete;

    void StartElement(std::u16string_view name);
    /// An attribute of the element started last (or of the held start tag).
    void Attribute(std::u16string_view name, std::u16string_view value);
    void Text(std::string_view utf8);
    void Text(std::u16string_view text);
    void Comment(std::u16string_view text);
    void EndElement();
    /// Attributes given from now on go to the start tag of the element started last, even once
    /// it has children, until ReleaseStartTag. Nothing reaches the file meanwhile.
    void HoldStartTag();
    void ReleaseStartTag();
    /// Saves the file: throws _com_error as IXMLDOMDocument::save does, and on any failure the
    /// target stays as it was.
    void Commit();

  private:
    struct State;
    std::unique_ptr<State> m_state;
};

}  // namespace kest
