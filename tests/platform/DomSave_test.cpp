#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

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
    doc->appendChild(doc->createProcessingInstruction(u"xml", u"encoding=\"UTF-8\""));
    IXMLDOMElementPtr root = doc->appendChild(Element(doc, u"CAL-DATA", u""));
    root->appendChild(doc->createComment(u"made by a test"));
    root->appendChild(Element(doc, u"FILENAME", u"urn:cdf"))
        ->appendChild(doc->createTextNode(u"a.cdf"));
    root->setAttribute(u"xmlns", _variant_t("urn:cdf"));
    root->setAttribute(u"xmlns:xsi", _variant_t("http://www.w3.org/2001/XMLSchema-instance"));
    root->setAttribute(u"xsi:schemaLocation", _variant_t("urn:cdf cdf.xsd"));
    root->appendChild(Element(doc, u"NOTE", u"urn:cdf"));
    return doc;
}

// Elements with their attributes and character data (adjacent text and CDATA joined), in order.
// Namespace declarations are left out: the saver adds its own.
std::u16string Shape(const IXMLDOMNodePtr& element) {
    std::u16string shape = u"<" + element->GetnodeName().ToU16String();
    IXMLDOMNamedNodeMapPtr map = element->Getattributes();
    while (IXMLDOMNodePtr a = map->nextNode()) {
        std::u16string name = a->GetnodeName().ToU16String();
        if (name != u"xmlns" && name.rfind(u"xmlns:", 0) != 0)
            shape += u" " + name + u"=" + _bstr_t(a->GetnodeValue()).ToU16String();
    }
    shape += u">";
    for (IXMLDOMNodePtr c = element->GetfirstChild(); c; c = c->GetnextSibling())
        shape +=
            c->GetnodeType() == NODE_ELEMENT ? Shape(c) : _bstr_t(c->GetnodeValue()).ToU16String();
    return shape + u"</>";
}

// Saves where saving must fail; the earlier file stays and no temporary file is left.
// Returns the error's description.
std::string FailingSave(const IXMLDOMDocument2Ptr& doc, const ScratchDir& dir,
                        const std::string& path) {
    const auto before = Entries(dir);
    const std::string earlier = ReadWholeFile(path);
    std::string description;
    try {
        doc->save(_variant_t(path));
        ADD_FAILURE() << "saved";
    } catch (const _com_error& e) {
        EXPECT_TRUE(FAILED(e.Error()));
        EXPECT_NE(e.Description().find(path), std::string::npos) << e.Description();
        description = e.Description();
    }
    EXPECT_EQ(ReadWholeFile(path), earlier);
    EXPECT_EQ(Entries(dir), before);
    return description;
}

}  // namespace

TEST(DomSave, WriterStyleDocumentHasNoRedundantDeclarations) {
    const std::string expected =
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
        "<CAL-DATA xmlns=\"urn:cdf\" xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" "
        "xsi:schemaLocation=\"urn:cdf cdf.xsd\"><!--made by a test--><FILENAME>a.cdf</FILENAME>"
        "<NOTE/></CAL-DATA>\n";
    IXMLDOMDocument2Ptr doc = WriterStyleDocument();
    EXPECT_EQ(Utf8Of(doc->Getxml()), expected);
    ScratchDir dir;
    doc->save(_variant_t(dir / "out.xml"));
    EXPECT_EQ(ReadWholeFile(dir / "out.xml"), expected);
    // Parsed, the declarations are plain attributes and must not be written twice either.
    EXPECT_EQ(Utf8Of(Parsed(expected)->Getxml()), expected);
}

TEST(DomSave, NamespacesOfCreatedNodesAreDeclaredWhereNotInScope) {
    // Root r, child and grandchild g in urn:a; what is written reads back the same.
    auto written = [](const char16_t* rootNs, const char16_t* child, const char16_t* childNs) {
        IXMLDOMDocument2Ptr doc = NewDocument();
        IXMLDOMNodePtr r = doc->appendChild(Element(doc, u"r", rootNs));
        r->appendChild(Element(doc, child, childNs))->appendChild(Element(doc, u"g", u"urn:a"));
        const std::string xml = Utf8Of(r->Getxml());
        EXPECT_EQ(Utf8Of(Parsed(xml)->GetdocumentElement()->Getxml()), xml);
        return xml;
    };
    EXPECT_EQ(written(u"urn:a", u"c", u"urn:a"), "<r xmlns=\"urn:a\"><c><g/></c></r>");
    EXPECT_EQ(written(u"urn:a", u"c", u"urn:b"),
              "<r xmlns=\"urn:a\"><c xmlns=\"urn:b\"><g xmlns=\"urn:a\"/></c></r>");
    EXPECT_EQ(written(u"urn:a", u"c", u""),
              "<r xmlns=\"urn:a\"><c xmlns=\"\"><g xmlns=\"urn:a\"/></c></r>");
    EXPECT_EQ(written(u"", u"c", u""), "<r><c><g xmlns=\"urn:a\"/></c></r>");
    EXPECT_EQ(written(u"urn:a", u"p:c", u"urn:p"),
              "<r xmlns=\"urn:a\"><p:c xmlns:p=\"urn:p\"><g/></p:c></r>");
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
        "tab\there, line\nfeed, return\rand\r\nboth",
        "markup <&> \"quoted\" 'apostrophes'",
        "]]> and ]]]]> and ]]",
    };
    for (const std::string& value : values) {
        SCOPED_TRACE(value);
        IXMLDOMDocument2Ptr doc = NewDocument();
        IXMLDOMElementPtr r = doc->appendChild(Element(doc, u"r", u""));
        r->setAttribute(u"v", _variant_t(value));
        r->appendChild(doc->createTextNode(_bstr_t(value)));
        IXMLDOMNodePtr cdata = doc->createNode(_variant_t(4L), u"", u"");
        cdata->PutnodeValue(_variant_t(value));
        r->appendChild(Element(doc, u"c", u""))->appendChild(cdata);

        IXMLDOMElementPtr root = Parsed(Utf8Of(doc->Getxml()))->GetdocumentElement();
        EXPECT_EQ(Utf8Of(_bstr_t(root->getAttribute(u"v"))), value);
        EXPECT_EQ(Utf8Of(root->GetfirstChild()->Gettext()), value);
        EXPECT_EQ(Utf8Of(root->GetlastChild()->Gettext()), value);
    }
}

TEST(DomSave, CommentsInstructionsAndTheDeclarationStayWellFormed) {
    IXMLDOMDocument2Ptr doc = NewDocument();
    IXMLDOMElementPtr r = doc->appendChild(Element(doc, u"r", u""));
    r->appendChild(doc->createComment(u"a--b-"));
    r->appendChild(doc->createProcessingInstruction(u"pi", u"x?>y"));
    EXPECT_EQ(Utf8Of(r->Getxml()), "<r><!--a- -b- --><?pi x? >y?></r>");
    EXPECT_EQ(Utf8Of(Parsed(Utf8Of(doc->Getxml()))->GetdocumentElement()->Getxml()),
              Utf8Of(r->Getxml()));
    // Output is UTF-8 whatever the source declared; without a declaration none is written.
    doc = Parsed("<?xml version='1.0' encoding='ISO-8859-1' standalone='yes'?><a>\xe9</a>");
    EXPECT_EQ(Utf8Of(doc->Getxml()),
              "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"yes\"?>\n<a>\xc3\xa9</a>\n");
    EXPECT_EQ(Utf8Of(Parsed("<a/>")->Getxml()), "<a/>\n");
}

TEST(DomSave, SaveReplacesAtomicallyAndReportsFailures) {
    ScratchDir dir;
    IXMLDOMDocument2Ptr doc = WriterStyleDocument();
    const std::string target = dir.Write("out.xml", "old content");
    ::chmod(target.c_str(), 0640);
    doc->save(_variant_t(target));
    EXPECT_EQ(ReadWholeFile(target).rfind("<?xml", 0), 0u);
    struct stat st {};
    ASSERT_EQ(::stat(target.c_str(), &st), 0);
    EXPECT_EQ(st.st_mode & 0777, 0640u);  // the replaced file keeps its permissions
    EXPECT_EQ(Entries(dir), std::vector<std::string>{"out.xml"});

    // Through a symbolic link the file it points to is replaced; the link stays.
    ASSERT_EQ(::symlink(target.c_str(), (dir / "link.xml").c_str()), 0);
    dir.Write("out.xml", "old content");
    doc->save(_variant_t(dir / "link.xml"));
    ASSERT_EQ(::lstat((dir / "link.xml").c_str(), &st), 0);
    EXPECT_TRUE(S_ISLNK(st.st_mode));
    EXPECT_EQ(ReadWholeFile(target).rfind("<?xml", 0), 0u);
    ::unlink((dir / "link.xml").c_str());

    // A name near the length limit still gets its temporary file.
    const std::string longName = dir / (std::string(250, 'n') + ".xml");
    doc->save(_variant_t(longName));
    EXPECT_EQ(ReadWholeFile(longName).rfind("<?xml", 0), 0u);
    ::unlink(longName.c_str());

    for (const std::string& path : {dir / "none/out.xml", dir.str(), std::string()}) {
        SCOPED_TRACE("'" + path + "'");
        FailingSave(doc, dir, path);
    }
}

TEST(DomSave, FailedWriteLeavesTheEarlierFileAndNoTemporary) {
    ScratchDir dir;
    const std::string target = dir.Write("keep.xml", "<earlier/>");
    IXMLDOMDocument2Ptr doc = Parsed("<big>" + std::string(100000, 'x') + "</big>");
    // A file size limit makes the write fail half way, as a full disk would.
    struct rlimit old {};
    ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &old), 0);
    auto oldHandler = ::signal(SIGXFSZ, SIG_IGN);
    struct rlimit small = old;
    small.rlim_cur = 4096;
    ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &small), 0);
    const std::string description = FailingSave(doc, dir, target);
    ::setrlimit(RLIMIT_FSIZE, &old);
    ::signal(SIGXFSZ, oldHandler);
    EXPECT_NE(description.find("File too large"), std::string::npos) << description;
}

TEST(DomSave, CharactersXmlCannotCarryStopTheSave) {
    ScratchDir dir;
    const std::string target = dir.Write("keep.xml", "<earlier/>");
    enum { kAttribute, kText, kComment };
    auto refused = [&](int where, const std::u16string& value) {
        IXMLDOMDocument2Ptr doc = NewDocument();
        IXMLDOMElementPtr r = doc->appendChild(Element(doc, u"r", u""));
        if (where == kAttribute) r->setAttribute(u"v", _variant_t(value));
        if (where == kText) r->appendChild(doc->createTextNode(_bstr_t(value)));
        if (where == kComment) r->appendChild(doc->createComment(_bstr_t(value)));
        const std::string description = FailingSave(doc, dir, target);
        const std::size_t at = description.find("holds character ");
        return at == std::string::npos ? description : description.substr(at + 16);
    };
    EXPECT_EQ(refused(kAttribute, u"a\u0001b"), "U+0001, which XML 1.0 cannot represent");
    EXPECT_EQ(refused(kText, std::u16string(1, u'\0')), "U+0000, which XML 1.0 cannot represent");
    EXPECT_EQ(refused(kComment, u"a\u0001b"), "U+0001, which XML 1.0 cannot represent");
    EXPECT_EQ(refused(kText, u"x\uFFFFy"), "U+FFFF, which XML 1.0 cannot represent");
}

TEST(DomSave, RandomTreesAndValuesReadBackIdentical) {
    std::mt19937 random(20240611);
    auto pick = [&](int n) { return static_cast<int>(random() % static_cast<unsigned>(n)); };
    // Characters that need escaping somewhere, and some beyond ASCII, one outside the BMP.
    const std::u16string pieces[] = {u"&",  u"<", u">", u"\"", u"'",      u"\t",     u"\n",
                                     u"\r", u"]", u"x", u" ",  u"\u00e9", u"\u20ac", u"\U0001F600"};
    auto value = [&] {
        std::u16string text;
        for (int i = pick(12); i > 0; --i) text += pieces[pick(14)];
        return _variant_t(text);
    };
    const char16_t* names[] = {u"a", u"b", u"p:c", u"q:d"};
    const char16_t* spaces[] = {u"", u"urn:x", u"urn:y"};
    for (int round = 0; round < 300; ++round) {
        SCOPED_TRACE(round);
        IXMLDOMDocument2Ptr doc = NewDocument();
        std::vector<IXMLDOMNodePtr> elements{doc->appendChild(Element(doc, u"r", spaces[pick(3)]))};
        for (int i = 0; i < 20; ++i) {
            IXMLDOMNodePtr parent =
                elements[static_cast<std::size_t>(pick(static_cast<int>(elements.size())))];
            const int kind = pick(4);
            if (kind == 0) {
                const char16_t* name = names[pick(4)];
                const char16_t* ns = spaces[pick(3)];
                if (name[1] == u':' && !*ns) ns = u"urn:p";  // a prefix needs a namespace
                elements.push_back(parent->appendChild(Element(doc, name, ns)));
            } else if (kind == 1) {
                IXMLDOMElementPtr(parent)->setAttribute(names[pick(2)], value());
            } else {  // text or CDATA
                IXMLDOMNodePtr node = doc->createNode(_variant_t(long(kind + 1)), u"", u"");
                node->PutnodeValue(value());
                parent->appendChild(node);
            }
        }
        const std::string first = Utf8Of(doc->Getxml());
        IXMLDOMDocument2Ptr back = NewDocument();
        ASSERT_EQ(back->loadBuffer(first.data(), first.size()), VARIANT_TRUE)
            << ReasonOf(back) << "\n"
            << first;
        // An empty text node leaves no trace, so the writing is stable from the second on.
        const std::string second = Utf8Of(back->Getxml());
        EXPECT_EQ(Utf8Of(Parsed(second)->Getxml()), second);
        EXPECT_EQ(Shape(doc->GetdocumentElement()), Shape(back->GetdocumentElement()));
    }
}
