#pragma once
// Helpers shared by the DOM tests: documents, temporary folders and file access.

#include <dirent.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "platform/XmlDom.h"

namespace kest {
namespace testing {

inline IXMLDOMDocument2Ptr NewDocument() {
    IXMLDOMDocument2Ptr doc;
    HRESULT hr = doc.CreateInstance(kProgIdDOMDocument40);
    EXPECT_EQ(hr, S_OK);
    return doc;
}

inline IXMLDOMDocument2Ptr Parsed(const std::string& xml) {
    IXMLDOMDocument2Ptr doc = NewDocument();
    doc->PutvalidateOnParse(VARIANT_FALSE);
    EXPECT_EQ(doc->loadBuffer(xml.data(), xml.size()), VARIANT_TRUE)
        << doc->GetparseError()->Getreason().ToString();
    return doc;
}

inline std::string Utf8Of(const _bstr_t& text) { return text.ToString(); }

inline std::string ReasonOf(const IXMLDOMDocument2Ptr& doc) {
    return doc->GetparseError()->Getreason().ToString();
}

/// A fresh folder, removed with its files at the end of the scope.
class TempDir {
public:
    TempDir() {
        char pattern[] = "/tmp/kest-dom-XXXXXX";
        const char* made = ::mkdtemp(pattern);
        EXPECT_NE(made, nullptr);
        m_path = made ? made : "/tmp";
    }
    ~TempDir() {
        for (const std::string& name : Entries()) {
            std::string p = m_path + "/" + name;
            ::chmod(p.c_str(), 0700);
            struct stat st {};
            if (::stat(p.c_str(), &st) == 0 && S_ISDIR(st.st_mode))
                ::rmdir(p.c_str());
            else
                ::unlink(p.c_str());
        }
        ::rmdir(m_path.c_str());
    }
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

    const std::string& Path() const { return m_path; }
    std::string File(const std::string& name) const { return m_path + "/" + name; }
    std::vector<std::string> Entries() const {
        std::vector<std::string> names;
        if (DIR* dir = ::opendir(m_path.c_str())) {
            while (dirent* e = ::readdir(dir)) {
                std::string n = e->d_name;
                if (n != "." && n != "..") names.push_back(n);
            }
            ::closedir(dir);
        }
        return names;
    }

private:
    std::string m_path;
};

inline void WriteFile(const std::string& path, const std::string& bytes) {
    std::ofstream out(path, std::ios::binary);
    out << bytes;
}

inline std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream s;
    s << in.rdbuf();
    return s.str();
}

}  // namespace testing
}  // namespace kest
