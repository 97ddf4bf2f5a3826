#include "manifest/StoredManifest.h"

#include <gtest/gtest.h>

#include "tests/manifest/ManifestSupport.h"
#ifdef _WIN32
#include "tests/support/Allocations.h"
#endif
#include "tests/support/LogCapture.h"

namespace tavi {
namespace {

using namespace test;
using namespace std::string_literals;

const std::string kHead = "FILES\nfile\n1:2:0:";

// The text behind kHead is an aux text, which shows where the whole text ends.
std::string auxText(const std::string& blob)
{
    const ManifestRef manifest = stored(blob);
    return manifest->fileCount() != 0 ? toUtf8(view(manifest->patches(0)[0].auxText())) : "none";
}

TEST(StoredManifest, EndsAtTheFirstZeroOrMalformedSequence)
{
    const std::string valid = "a\xC3\xA4\xE6\x97\xA5\xED\xA0\x80\xF0\x9F\x98\x80";
    const std::string later = "\0"s + std::string(100000, 'x') + "\xC3\xA4\n1:2:3:4:5:6:7:8:9";
    for (const std::string& fault : {"\x80"s, "\xFF"s, "\xE6\x97z"s, "\xC3\xC3\xA4"s, "\0b\0"s, "\0\xFF"s, later}) {
        // The end of the first read cuts each character at each place.
        for (std::size_t length = 64 * 1024 - 40; length < 64 * 1024; ++length) {
            const std::string before = std::string(length, 'x') + valid;
            EXPECT_EQ(auxText(packed(kHead + before + fault + "z")), before) << fault;
            EXPECT_EQ(auxText(packed(kHead + before + "z")), before + "z") << "left behind by " << fault;
        }
    }
}

TEST(StoredManifest, KeepsACharacterThatTheEndOfATextCutsInTwo)
{
    for (const std::string whole : {"\xC3\xA4", "\xE6\x97\xA5", "\xF0\x9F\x98\x80"}) {
        for (std::size_t cut = 1; cut < whole.size(); ++cut) {
            EXPECT_EQ(auxText(packed(kHead + "a" + whole.substr(0, cut))), "a");
            EXPECT_EQ(auxText(packed(whole.substr(cut) + "x\n\n\n" + kHead + "b")), "b");
            // Also behind a zero. A text that does not continue the character ends at once.
            EXPECT_EQ(auxText(packed(kHead + "a\0"s + whole.substr(0, cut))), "a");
            EXPECT_EQ(auxText(packed(kHead + "b")), "none");
            EXPECT_EQ(auxText(packed(kHead + "b")), "b");
        }
    }
}

TEST(StoredManifest, InflatesGzipAndWhatIsLeftOfABrokenBlob)
{
    LogCapture log;
    EXPECT_EQ(auxText(packed(kHead + "gzip", wxZLIB_GZIP)), "gzip");
    EXPECT_EQ(auxText("") + auxText(packed("")), "nonenone");
    EXPECT_TRUE(log.take().empty());
    EXPECT_EQ(auxText("no compressed data") + auxText(packed(kHead).substr(0, 1)), "nonenone");
    const std::string blob = packed(kHead + std::string(300000, 'x')), left = auxText(blob.substr(0, blob.size() / 2));
    EXPECT_GT(left.size(), 100000u);
    EXPECT_EQ(left.find_first_not_of('x'), std::string::npos);
    EXPECT_FALSE(log.take().empty());
}

#ifdef _WIN32 // Only these tests have operators that fail.
TEST(StoredManifest, IsWholeAfterALoadThatRanOutOfMemory)
{
    const LogCapture log;
    // The end of the first read cuts a character in two.
    const std::string blob = packed(kHead + std::string(64 * 1024 - kHead.size() - 1, 'x') + "\xC3\xA4\n\nother\n1");
    const std::string whole = dump(stored(blob));
    int succeeding = 0;
    for (ManifestRef read; !read; ++succeeding) {
        try {
            const FailingAllocations failing(succeeding, Heap::c, 1);
            read = stored(blob);
        } catch (const std::bad_alloc&) {
        }
        EXPECT_TRUE(!read || dump(read) == whole);
        ASSERT_EQ(dump(stored(blob)), whole) << "after allocation " << succeeding << " failed";
    }
    EXPECT_GT(succeeding, 20);
}
#endif

} // namespace
} // namespace tavi
