#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>

#include <random>
#include <string>
#include <vector>

#include "DomTestUtil.h"
#include "platform/XmlDom.h"

using namespace kest;
using namespace kest::testing;

namespace {

IXMLDOMNodePtr Element(IXMLDOMDocument2Ptr& doc, const char16_t* name, const char16_t* ns) {
    return doc->createNode(_variant_t(long(NODE_ELEMENT)), name, ns);
}

// Builds a document the way a CDF writer does: declaration, root with an empty namespace and
// explicit xmlns attributes, children created in the root's namespace.
IXMLDOMDocument2Ptr WriterStyleDocument() {
    IXMLDOMDocument2Ptr doc = NewDocument();
    IXMLDOMNodePtr declaration = doc->createNode(_variant_t(7L), u"xml", u"");
    IXMLDOMAttributePtr encoding = doc->createAttribute(u"encoding");
    encoding->PutnodeValue(_variant_t("UTF-8"));
    declaration->Getattributes()->setNamedItem(encoding);
    doc->appendChild(declaration);
    IXMLDOMNodePtr root = Element(doc, u"CAL-DATA", u"");
    doc->appendChild(root);
    root->appendChild(doc->createComment(u"made by a test"));
    IXMLDOMNodePtr name = root->appendChild(Element(doc, u"FILENAME", u"urn:cdf"));
    IXMLDOMNodePtr text = doc->createNode(_variant_t(3L), u"", u"");
    text->PutnodeValue(_variant_t("a.cdf"));
    name->appendChild(text);
    const char16_t* attributes[][2] = {
        {u"xmlns", u"urn:cdf"},
        {u"xmlns:xsi", u"http://www.w3.org/2001/XMLSchema-instance"},
        {u"xsi:schemaLocation", u"urn:cdf cdf.xsd"},
    };
    for (auto& a : attributes) {
        IXMLDOMAttributePtr attribute = doc->createAttribute(a[0]);
        attribute->PutnodeValue(_variant_t(a[1]));
        root->Getattributes()->setNamedItem(attribute);
    }
    root->appendChild(Element(doc, u"NOTE", u"urn:cdf"));
    return doc;
}

// Elements with their attributes and character data, runs of text and CDATA joined, in order.
void AppendShape(const IXMLDOMNodePtr& element, std::vector<std::u16string>& shape) {
    shape.push_back(u"<" + element->GetnodeName().ToU16String());
    IXMLDOMNamedNodeMapPtr map = element->Getattributes();
    while (IXMLDOMNodePtr a = map->nextNode()) {
        std::u16string name = a->GetnodeName().ToU16String();
        if (name == u"xmlns" || name.rfind(u"xmlns:", 0) == 0) continue;  // added by the saver
        shape.push_back(name + u"=" + _bstr_t(a->GetnodeValue()).ToU16String());
    }
    std::u16string run;
    for (IXMLDOMNodePtr c = element->GetfirstChild(); c; c = c->GetnextSibling()) {
        if (c->GetnodeType() == NODE_ELEMENT) {
            if (!run.empty()) shape.push_back(u"#" + run);
            run.clear();
            AppendShape(c, shape);
        } else {
            run += _bstr_t(c->GetnodeValue()).View();
        }
    }
    if (!run.empty()) shape.push_back(u"#" + run);
    shape.push_back(u"</>");
}

std::vector<std::u16string> Shape(const IXMLDOMNodePtr& element) {
    std::vector<std::u16string> shape;
    AppendShape(element, shape);
    return shape;
}

}  // namespace

TEST(DomSave, WriterStyleDocumentHasNoRedundantDeclarations) {
    IXMLDOMDocument2Ptr doc = WriterStyleDocument();
    const std::string expected =
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
        "<CAL-DATA xmlns=\"urn:cdf\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" "
        "xsi:schemaLocation=\"urn:cdf cdf.xsd\"><!--made by a test--><FILENAME>a.cdf</FILENAME>"
        "<NOTE/></CAL-DATA>\n";
    EXPECT_EQ(Utf8Of(doc->Getxml()), expected);
    TempDir dir;
    doc->save(_variant_t(dir.File("out.xml")));
    EXPECT_EQ(ReadFile(dir.File("out.xml")), expected);
    IXMLDOMDocument2Ptr back = NewDocument();
    back->PutvalidateOnParse(VARIANT_FALSE);
    ASSERT_EQ(back->load(_variant_t(dir.File("out.xml"))), VARIANT_TRUE) << ReasonOf(back);
    EXPECT_EQ(Utf8Of(back->Getxml()), expected);
}

TEST(DomSave, NamespacesOfCreatedNodesAreDeclaredWhereNotInScope) {
    struct Row {
        const char* label;
        const char16_t* rootNs;
        const char16_t* childName;
        const char16_t* childNs;
        const char* expected;
    };
    const Row rows[] = {
        {"same default", u"urn:a", u"c", u"urn:a", "<r xmlns=\"urn:a\"><c><g/></c></r>"},
        {"other default", u"urn:a", u"c", u"urn:b",
         "<r xmlns=\"urn:a\"><c xmlns=\"urn:b\"><g xmlns=\"urn:a\"/></c></r>"},
        {"no namespace under default", u"urn:a", u"c", u"",
         "<r xmlns=\"urn:a\"><c xmlns=\"\"><g xmlns=\"urn:a\"/></c></r>"},
        {"no namespace anywhere", u"", u"c", u"", "<r><c><g xmlns=\"urn:a\"/></c></r>"},
        {"prefixed", u"urn:a", u"p:c", u"urn:p",
         "<r xmlns=\"urn:a\"><p:c xmlns:p=\"urn:p\"><g/></p:c></r>"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        IXMLDOMDocument2Ptr doc = NewDocument();
        IXMLDOMNodePtr r = doc->appendChild(Element(doc, u"r", row.rootNs));
        IXMLDOMNodePtr c = r->appendChild(Element(doc, row.childName, row.childNs));
        c->appendChild(Element(doc, u"g", u"urn:a"));
        EXPECT_EQ(Utf8Of(r->Getxml()), row.expected);
        // What is written reads back with the same structure.
        IXMLDOMDocument2Ptr back = Parsed(Utf8Of(doc->Getxml()));
        EXPECT_EQ(Utf8Of(back->GetdocumentElement()->Getxml()), row.expected);
    }
    // A prefixed attribute created in a namespace gets its declaration too.
    IXMLDOMDocument2Ptr doc = NewDocument();
    IXMLDOMElementPtr r = doc->appendChild(Element(doc, u"r", u""));
    IXMLDOMNodePtr attribute =
        doc->createNode(_variant_t(2L), u"xsi:nil", u"http://www.w3.org/2001/XMLSchema-instance");
    attribute->PutnodeValue(_variant_t("true"));
    r->Getattributes()->setNamedItem(attribute);
    EXPECT_EQ(Utf8Of(r->Getxml()),
              "<r xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" xsi:nil=\"true\"/>");
}

TEST(DomSave, EveryValueReadsBackIdentical) {
    const std::string values[] = {
        "plain",
        "tab\there, line\nfeed, return\rand\r\nboth",
        "markup <&> \"quoted\" 'apostrophes'",
        "]]> and ]]]]> and ]]",
        "  leading and trailing  ",
        "\xc3\xa4\xe2\x82\xac\xf0\x9f\x98\x80 beyond ASCII",
        "",
    };
    for (const std::string& value : values) {
        SCOPED_TRACE(value);
        IXMLDOMDocument2Ptr doc = NewDocument();
        IXMLDOMElementPtr r = doc->appendChild(Element(doc, u"r", u""));
        r->setAttribute(u"v", _variant_t(value));
        r->appendChild(doc->createTextNode(_bstr_t(value)));
        IXMLDOMNodePtr cdata = doc->createNode(_variant_t(4L), u"", u"");
        cdata->PutnodeValue(_variant_t(value));
        IXMLDOMElementPtr holder = r->appendChild(Element(doc, u"c", u""));
        holder->appendChild(cdata);

        IXMLDOMDocument2Ptr back = Parsed(Utf8Of(doc->Getxml()));
        IXMLDOMElementPtr root = back->GetdocumentElement();
        EXPECT_EQ(Utf8Of(_bstr_t(root->getAttribute(u"v"))), value);
        EXPECT_EQ(Utf8Of(root->GetfirstChild()->Gettext()), value);
        EXPECT_EQ(Utf8Of(root->GetlastChild()->Gettext()), value);
    }
}

TEST(DomSave, CommentsAndInstructionsStayWellFormed) {
    IXMLDOMDocument2Ptr doc = NewDocument();
    IXMLDOMElementPtr r = doc->appendChild(Element(doc, u"r", u""));
    r->appendChild(doc->createComment(u"a--b-"));
    r->appendChild(doc->createProcessingInstruction(u"pi", u"x?>y"));
    EXPECT_EQ(Utf8Of(r->Getxml()), "<r><!--a- -b- --><?pi x? >y?></r>");
    IXMLDOMDocument2Ptr back = Parsed(Utf8Of(doc->Getxml()));
    EXPECT_EQ(Utf8Of(back->GetdocumentElement()->Getxml()), Utf8Of(r->Getxml()));
}

TEST(DomSave, DeclarationIsWrittenForTheUtf8Output) {
    IXMLDOMDocument2Ptr doc =
        Parsed("<?xml version='1.0' encoding='ISO-8859-1' standalone='yes'?><a>\xe9</a>");
    TempDir dir;
    doc->save(_variant_t(dir.File("a.xml")));
    EXPECT_EQ(ReadFile(dir.File("a.xml")),
              "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"yes\"?>\n<a>\xc3\xa9</a>\n");
    IXMLDOMDocument2Ptr none = Parsed("<a/>");
    EXPECT_EQ(Utf8Of(none->Getxml()), "<a/>\n");
}

TEST(DomSave, SaveReplacesAtomicallyAndReportsFailures) {
    TempDir dir;
    IXMLDOMDocument2Ptr doc = WriterStyleDocument();
    std::string target = dir.File("out.xml");
    WriteFile(target, "old content");
    ::chmod(target.c_str(), 0640);
    doc->save(_variant_t(target));
    EXPECT_EQ(ReadFile(target).rfind("<?xml", 0), 0u);
    struct stat st {};
    ASSERT_EQ(::stat(target.c_str(), &st), 0);
    EXPECT_EQ(st.st_mode & 0777, 0640u);  // the replaced file keeps its permissions
    EXPECT_EQ(dir.Entries(), std::vector<std::string>{"out.xml"});

    // Through a symbolic link the file it points to is replaced; the link stays.
    ASSERT_EQ(::symlink(target.c_str(), dir.File("link.xml").c_str()), 0);
    WriteFile(target, "old content");
    doc->save(_variant_t(dir.File("link.xml")));
    struct stat link {};
    ASSERT_EQ(::lstat(dir.File("link.xml").c_str(), &link), 0);
    EXPECT_TRUE(S_ISLNK(link.st_mode));
    EXPECT_EQ(ReadFile(target).rfind("<?xml", 0), 0u);
    ::unlink(dir.File("link.xml").c_str());

    // A name near the length limit still gets its temporary file.
    std::string longName = dir.File(std::string(250, 'n') + ".xml");
    doc->save(_variant_t(longName));
    EXPECT_EQ(ReadFile(longName).rfind("<?xml", 0), 0u);
    ::unlink(longName.c_str());

    struct Row {
        const char* label;
        std::string path;
    };
    const Row rows[] = {
        {"missing folder", dir.File("none/out.xml")},
        {"folder as target", dir.Path()},
        {"empty path", ""},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.label);
        try {
            doc->save(_variant_t(row.path));
            ADD_FAILURE() << "no error";
        } catch (const _com_error& e) {
            EXPECT_TRUE(FAILED(e.Error()));
            EXPECT_NE(e.Description().find(row.path), std::string::npos) << e.Description();
        }
    }
    EXPECT_EQ(dir.Entries(), std::vector<std::string>{"out.xml"});
}

TEST(DomSave, FailedWriteLeavesTheEarlierFileAndNoTemporary) {
    TempDir dir;
    std::string target = dir.File("keep.xml");
    WriteFile(target, "<earlier/>");
    IXMLDOMDocument2Ptr doc = Parsed("<big>" + std::string(100000, 'x') + "</big>");
    // A file size limit makes the write fail half way, as a full disk would.
    struct rlimit old {};
    ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &old), 0);
    auto oldHandler = ::signal(SIGXFSZ, SIG_IGN);
    struct rlimit small = old;
    small.rlim_cur = 4096;
    ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &small), 0);
    HRESULT code = S_OK;
    std::string description;
    try {
        doc->save(_variant_t(target));
    } catch (const _com_error& e) {
        code = e.Error();
        description = e.Description();
    }
    ::setrlimit(RLIMIT_FSIZE, &old);
    ::signal(SIGXFSZ, oldHandler);
    EXPECT_TRUE(FAILED(code));
    EXPECT_NE(description.find(target), std::string::npos) << description;
    EXPECT_NE(description.find("File too large"), std::string::npos) << description;
    EXPECT_EQ(ReadFile(target), "<earlier/>");
    EXPECT_EQ(dir.Entries(), std::vector<std::string>{"keep.xml"});
}

TEST(DomSave, RandomTreesAndValuesReadBackIdentical) {
    std::mt19937 random(20240611);
    auto pick = [&](int n) { return static_cast<int>(random() % static_cast<unsigned>(n)); };
    // Any character XML allows, weighted towards the ones that need escaping.
    auto value = [&]() {
        static const char16_t special[] = u"&<>\"'\t\n\r]";
        std::u16string text;
        int length = pick(12);
        for (int i = 0; i < length; ++i) {
            switch (pick(4)) {
                case 0: text += special[pick(9)]; break;
                case 1: text += static_cast<char16_t>(0x20 + pick(0x5F)); break;
                case 2: text += static_cast<char16_t>(0xA0 + pick(0xD700 - 0xA0)); break;
                default: text += u"\U0001F600"; break;
            }
        }
        return text;
    };
    const char16_t* names[] = {u"a", u"b", u"p:c", u"q:d"};
    const char16_t* spaces[] = {u"", u"urn:x", u"urn:y"};
    for (int round = 0; round < 300; ++round) {
        SCOPED_TRACE(round);
        IXMLDOMDocument2Ptr doc = NewDocument();
        IXMLDOMNodePtr root = doc->appendChild(Element(doc, u"r", spaces[pick(3)]));
        std::vector<IXMLDOMNodePtr> elements{root};
        std::vector<std::u16string> texts;
        for (int i = 0; i < 20; ++i) {
            IXMLDOMNodePtr parent = elements[static_cast<std::size_t>(pick(static_cast<int>(elements.size())))];
            switch (pick(4)) {
                case 0: {
                    const char16_t* name = names[pick(4)];
                    const char16_t* ns = spaces[pick(3)];
                    if (name[1] == u':' && !*ns) ns = u"urn:p";  // a prefix needs a namespace
                    elements.push_back(parent->appendChild(Element(doc, name, ns)));
                    break;
                }
                case 1: IXMLDOMElementPtr(parent)->setAttribute(names[pick(2)], _variant_t(value())); break;
                case 2: parent->appendChild(doc->createTextNode(_bstr_t(value()))); break;
                default: {
                    IXMLDOMNodePtr cdata = doc->createNode(_variant_t(4L), u"", u"");
                    cdata->PutnodeValue(_variant_t(value()));
                    parent->appendChild(cdata);
                }
            }
        }
        std::string first = Utf8Of(doc->Getxml());
        IXMLDOMDocument2Ptr back = NewDocument();
        if (back->loadBuffer(first.data(), first.size()) != VARIANT_TRUE) {
            WriteFile("/tmp/h2-random-fail.xml", first);
            FAIL() << ReasonOf(back);
        }
        // Text reads back as written (an empty text node leaves no trace, so the first text
        // may differ from the second; from then on it is stable).
        std::string second = Utf8Of(back->Getxml());
        EXPECT_EQ(Utf8Of(Parsed(second)->Getxml()), second);
        // Value by value: the same elements and attributes, and between them the same
        // character data (adjacent text and CDATA made separately may read back joined).
        EXPECT_EQ(Shape(doc->GetdocumentElement()), Shape(back->GetdocumentElement()));
    }
}

TEST(DomSave, CharactersXmlCannotCarryStopTheSave) {
    TempDir dir;
    std::string target = dir.File("keep.xml");
    WriteFile(target, "<earlier/>");
    const std::u16string values[] = {std::u16string(u"a\u0001b"), std::u16string(1, u'\0'),
                                     u"\uFFFE", u"x\uFFFFy"};
    for (const std::u16string& value : values) {
        for (int where = 0; where < 3; ++where) {
            SCOPED_TRACE(where);
            IXMLDOMDocument2Ptr doc = NewDocument();
            IXMLDOMElementPtr r = doc->appendChild(Element(doc, u"r", u""));
            if (where == 0) r->setAttribute(u"v", _variant_t(value));
            if (where == 1) r->appendChild(doc->createTextNode(_bstr_t(value)));
            if (where == 2) r->appendChild(doc->createComment(_bstr_t(value)));
            try {
                doc->save(_variant_t(target));
                ADD_FAILURE() << "saved";
            } catch (const _com_error& e) {
                EXPECT_EQ(e.Error(), E_FAIL);
                EXPECT_NE(e.Description().find("which XML 1.0 cannot represent"), std::string::npos)
                    << e.Description();
            }
            EXPECT_EQ(ReadFile(target), "<earlier/>");
            EXPECT_EQ(dir.Entries(), std::vector<std::string>{"keep.xml"});
        }
    }
}
