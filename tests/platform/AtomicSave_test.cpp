// Saves leave no temporary files behind: a later save of the same target removes those of writers
// that have ended, and never one of a writer that still runs.
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include "DomTestUtil.h"
#include "platform/XmlDom.h"

using namespace kest;
using namespace kest::testing;

TEST(AtomicSave, LaterSavesRemoveTemporariesOfEndedWritersOnly) {
    test::ScratchDir dir;
    pid_t ended = ::fork();
    if (ended == 0) ::_exit(0);
    ASSERT_GT(ended, 0);
    ::waitpid(ended, nullptr, 0);
    const std::string live = ".out.xml." + std::to_string(::getppid()) + ".tmp-abcdef";
    const std::string dead = ".out.xml." + std::to_string(ended) + ".tmp-abcdef";
    const std::string other = ".other.xml." + std::to_string(ended) + ".tmp-abcdef";
    for (const std::string& name : {live, dead, other}) dir.Write(name, "partial");
    IXMLDOMDocument2Ptr doc = NewDocument();
    ASSERT_TRUE(doc->loadXML(_bstr_t(u"<r/>")));
    doc->save(_variant_t(dir / "out.xml"));
    std::set<std::string> left;
    for (const auto& entry : std::filesystem::directory_iterator(dir.Path()))
        left.insert(entry.path().filename().string());
    EXPECT_EQ(left, (std::set<std::string>{"out.xml", live, other}));
}
