// How the converter reads files it meets in the wild: read options, structured load errors,
// standard input, big texts, entities that are never loaded, and a failing walk.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <new>
#include <thread>

#include "core/KestCalmorph.h"
#include "support/TestFiles.h"

using namespace kest;
using test::ReadWholeFile;
using test::ScratchDir;

namespace {

const std::string kSchema = std::string(KEST_SOURCE_DIR) + "/schema/cdf.xsd";
const std::string kValid =
    ReadWholeFile(std::string(KEST_TEST_DATA_DIR) + "/schema/valid-compact.cdf");

// The valid file with `from` replaced by `to` (the first occurrence).
std::string Edit(std::string text, const std::string& from, const std::string& to) {
    return text.replace(text.find(from), from.size(), to);
}

std::string Read(KestCalmorph& converter, const std::string& path) {
    CComBSTR message;
    converter.ConvertXMLtoCPP(CComBSTR(path), true, message);
    return message.ToString();
}

KestReadOptions Options(bool validate, bool network = true, std::string schema = "",
                        bool fallback = false) {
    return KestReadOptions{validate, network, std::move(schema), fallback};
}

// One allocation fails on demand, to make the walk fail where nothing else can.
long g_allocationsLeft = -1;
long g_allocations = 0;

}  // namespace

void* operator new(std::size_t size) {
    ++g_allocations;
    if (g_allocationsLeft >= 0 && g_allocationsLeft-- == 0) throw std::bad_alloc();
    if (void* p = std::malloc(size ? size : 1)) return p;
    throw std::bad_alloc();
}
void* operator new[](std::size_t size) { return operator new(size); }
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
    try {
        return operator new(size);
    } catch (...) {
        return nullptr;
    }
}
void* operator new[](std::size_t size, const std::nothrow_t& tag) noexcept {
    return operator new(size, tag);
}
void operator delete(void* p) noexcept { std::free(p); }
void operator delete(void* p, std::size_t) noexcept { std::free(p); }
void operator delete[](void* p) noexcept { std::free(p); }
void operator delete[](void* p, std::size_t) noexcept { std::free(p); }

TEST(KestCalmorphRead, OptionsAndLoadErrorsSayWhatHappenedAndWhatToDo) {
    const std::string missing = Edit(kValid, "cdf.xsd", "gone.xsd"), none;
    const std::string offline = Edit(kValid, "cdf.xsd", "http://127.0.0.1:9/cdf.xsd");
    const std::string invalid = Edit(kValid, "<FILENAME></FILENAME>", "");
    const std::string dtd = "<!DOCTYPE CAL-DATA [<!ENTITY x SYSTEM 'x.txt'><!ENTITY % p ''> %p;]>";
    const std::string entities = Edit(kValid, "<CAL-DATA", dtd + "<CAL-DATA");
    const std::string hint = "use --schema or --no-validate", never = "', which is not declared";
    const KestReadOptions plain, fallback = Options(true, true, "", true), off = Options(false);
    struct Row {
        std::string text;
        KestReadOptions options;
        long line, column;
        std::string reason, hint;
        bool builtin;
    } rows[] = {
        {kValid, plain, 0, 0, none, none, false},
        {missing, plain, 0, 0, "gone.xsd cannot be read", hint, false},
        {missing, fallback, 0, 0, none, none, true},
        {missing, off, 0, 0, none, none, false},
        {missing, Options(true, true, kSchema), 0, 0, none, none, false},
        {offline, Options(true, false), 0, 0, "ServerHTTPRequest", hint, false},
        {offline, Options(true, false, "", true), 0, 0, none, none, true},
        {Edit(kValid, "UTF-8", "X-NONE"), plain, 1, 31, "unknown encoding",
         "save the file as UTF-8", false},
        {Edit(kValid, "</FILENAME>", "</NAME>"), off, 2, 445, "mismatched tag", none, false},
        // Element names as written; a text over 1 MB is validated as a tree.
        {Edit(invalid, "<NOTE>", "<NOTE>" + std::string(1100000, 'n')), plain, 2, 0,
         "Element 'COMPANY-INFO': This element is not expected. Expected is ( FILENAME ).", none,
         false},
        {Edit(entities, "<FILENAME>", "<FILENAME>&y;"), off, 2, 511, "entity 'y" + never, none,
         false},
        {Edit(entities, "<NOTE>", "<NOTE n='&y;'>"), off, 2, 360, "entity 'y" + never, none, false},
        {Edit(entities, "<FILENAME>", "<FILENAME>&x;"), off, 2, 511,
         "external entity 'x' (x.txt), which is never loaded", none, false},
    };
    ScratchDir dir;
    dir.Write("cdf.xsd", ReadWholeFile(kSchema));
    for (const Row& row : rows) {
        SCOPED_TRACE(row.text.substr(0, 300));
        KestCalmorph converter;
        converter.SetReadOptions(row.options);
        std::string message = Read(converter, dir.Write("a.cdf", row.text));
        const KestLoadError& error = converter.GetLastLoadError();
        bool failed = !row.reason.empty();
        EXPECT_EQ((std::vector<bool>{error.code != 0, !message.empty(), !error.reason.empty()}),
                  std::vector<bool>(3, failed))
            << message;
        EXPECT_NE(error.reason.find(row.reason), std::string::npos) << error.reason;
        EXPECT_EQ(error.reason.find(" at line"), std::string::npos) << error.reason;
        EXPECT_EQ(std::to_string(error.line) + ":" + std::to_string(error.column),
                  std::to_string(row.line) + ":" + std::to_string(row.column));
        EXPECT_EQ(error.hint, row.hint);
        EXPECT_EQ(converter.UsedBuiltinSchema(), row.builtin);
    }
}

// Pipes cannot be read twice: the validating read and the parse share one read of the bytes, and
// a relative schema is looked up in the current directory, else the built-in one serves.
TEST(KestCalmorphRead, StandardInputAndPipesReadOnce) {
    ScratchDir dir;
    std::string cwd = std::filesystem::current_path();
    ASSERT_EQ(::chdir(dir.str().c_str()), 0);
    int savedStdin = ::dup(STDIN_FILENO);
    CComBSTR message;
    for (auto [path, beside] : {std::pair{"-", true}, {"/dev/stdin", true}, {"-", false}}) {
        SCOPED_TRACE(path);
        beside ? (void)dir.Write("cdf.xsd", ReadWholeFile(kSchema)) : (void)std::remove("cdf.xsd");
        int fds[2];
        ASSERT_EQ(::pipe(fds), 0);
        ::dup2(fds[0], STDIN_FILENO);
        ::close(fds[0]);
        std::thread writer([&] {
            (void)!::write(fds[1], kValid.data(), kValid.size());
            ::close(fds[1]);
        });
        KestCalmorph converter;
        converter.SetReadOptions(Options(true, false, "", true));
        EXPECT_EQ(Read(converter, path), "");
        writer.join();
        EXPECT_EQ(converter.UsedBuiltinSchema(), !beside);
        EXPECT_EQ(converter.ConvertXMLtoCPP(CComBSTR(), false, message).GetCalListSize(), 2);
    }
    ::dup2(savedStdin, STDIN_FILENO);
    ::close(savedStdin);
    ASSERT_EQ(::chdir(cwd.c_str()), 0);
}

// Value lists beyond the XML parsers' usual 10,000,000-byte text limit read, validate and write.
TEST(KestCalmorphRead, BigValueListsReadValidateAndWrite) {
    std::string values;
    long written = 0;
    for (; values.size() < 12'000'000; ++written)
        values += (written ? " " : "") + std::to_string(written % 1000);
    ScratchDir dir;
    dir.Write("cdf.xsd", ReadWholeFile(kSchema));
    // The empty label value of the second item could not be written back: give it one.
    std::string text = Edit(kValid, ">1.5 2 3<", ">" + values + "<");
    std::string path = dir.Write("big.cdf", Edit(text, "LABEL\"></", "LABEL\">x</"));
    KestCalmorph converter;
    EXPECT_EQ(Read(converter, path), "");
    CComBSTR message;
    KestCdfCalData data = converter.ConvertXMLtoCPP(CComBSTR(), false, message);
    _variant_t list = data.GetCalLists()[0].GetCalItems()[0].GetCalItemValue().GetValue();
    EXPECT_EQ(list.parray->rgsabound[0].cElements, static_cast<ULONG>(written));
    ASSERT_TRUE(converter.ConvertCPPToXML(data, CComBSTR(dir / "out.cdf"), CComBSTR(u"")));
    CComBSTR verdict =
        converter.ValidateXMLFileWithLocaleXSD(CComBSTR(dir / "out.cdf"), CComBSTR(kSchema));
    EXPECT_EQ(verdict.ToString(), "");
    EXPECT_GT(std::filesystem::file_size(dir / "out.cdf"), values.size());
}

// Reason 13 reaches the host when the walk itself fails: the k-th allocation fails, for every k
// of one read, and some k lands in the walk rather than in a reader with its own code.
TEST(KestCalmorphRead, WalkFailureReachesTheHostAsReason13) {
    ScratchDir dir;
    std::string path = dir.Write("a.cdf", kValid);
    auto read = [&](long failing) {
        KestCalmorph converter;
        converter.SetReadOptions(Options(false));
        CComBSTR message(u"before");
        g_allocationsLeft = failing;
        int code = -1;
        try {
            converter.ConvertXMLtoCPP(CComBSTR(path), true, message);
        } catch (const KestCalmorphDLLError& error) {
            code = error.GetReason();
            EXPECT_TRUE(code != reason::kWalkFailed || message.ToString() == "before");
        } catch (...) {
        }
        g_allocationsLeft = -1;
        return code;
    };
    long before = g_allocations;
    ASSERT_EQ(read(-1), -1);
    long total = g_allocations - before;
    long walkFailures = 0;
    for (long k = 0; k < total; ++k) walkFailures += read(k) == reason::kWalkFailed;
    EXPECT_GT(walkFailures, 0) << total << " allocations";
}
