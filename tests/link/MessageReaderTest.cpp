#include "link/MessageReader.h"

#include <algorithm>
#include <vector>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"

namespace tavi {
namespace {

using test::bytes;

// Plays a peer from a list of parts, one at a time; an empty part is a look that finds nothing. The end of the list is
// the end of the pipe.
class PlayedSource : public ByteSource {
  public:
    explicit PlayedSource(std::vector<std::string> parts) : parts_(std::move(parts)) {}
    bool peek(std::uint32_t& available) override
    {
        if (at_ == parts_.size())
            return false;
        available = static_cast<std::uint32_t>(parts_[at_].size());
        at_ += parts_[at_].empty();
        return true;
    }
    void pause() override
    {
        ++pauses;
    }
    bool startRead(unsigned char* into, std::uint32_t size) override
    {
        largestRead = std::max(largestRead, size);
        if (at_ == parts_.size())
            return false;
        std::string& part = parts_[at_];
        part.erase(0, part.copy(reinterpret_cast<char*>(into), size));
        at_ += part.empty();
        ++open;
        return true;
    }
    bool finishRead() override
    {
        --open;
        return true;
    }
    void abandonRead() override
    {
        finishRead();
    }

    int pauses = 0;
    int open = 0;
    std::uint32_t largestRead = 0;

  private:
    std::vector<std::string> parts_;
    std::size_t at_ = 0;
};

const std::string kEnd = bytes("34000000 14000000") + std::string(20, '\0');

TEST(MessageReader, ReadsWhatPeersSend)
{
    const std::string head = kEnd.substr(0, 8), body = kEnd.substr(8);
    const struct {
        const char* what;
        std::vector<std::string> parts;
        bool message;
        int pauses;
        std::uint32_t largestRead;
    } cases[] = {
        {"a frame", {kEnd}, true, 1, 20},
        {"a frame in two parts", {head, "", body}, true, 2, 20},
        {"a payload cut short, the rest reading as zeros", {head, body.substr(0, 3), "x"}, true, 1, 20},
        {"nothing", {}, false, 0, 0},
        {"a header cut short", {head.substr(0, 5)}, false, 1, 8},
        {"no payload", {head}, false, 1, 8},
        {"an announced length of 0", {bytes("34000000 00000000"), body}, false, 1, 8},
        {"an unknown type", {bytes("1e000000 14000000") + body}, false, 1, 20},
        {"a length of 0xffffffff", {bytes("34000000 ffffffff") + body}, true, 1, 1024},
        {"a length that is there", {bytes("34000000 00002000") + std::string(0x200000, '\0')}, true, 1, 0x200000},
    };
    for (const auto& test : cases) {
        PlayedSource source(test.parts);
        EXPECT_EQ(readFrame(source, nullptr) != nullptr, test.message) << test.what;
        EXPECT_EQ(source.pauses, test.pauses) << test.what;
        EXPECT_EQ(source.open, 0) << test.what;
        EXPECT_EQ(source.largestRead, test.largestRead) << test.what;
    }
}

TEST(MessageReader, GivesUpWheneverItIsTold)
{
    const std::vector<std::string> frame = {"", kEnd.substr(0, 8), "", kEnd.substr(8)};
    int asked = 0;
    PlayedSource whole(frame);
    EXPECT_TRUE(readFrame(whole, [&] { return ++asked > 1000; }));
    EXPECT_EQ(asked, 5); // at two looks for the header, twice after it, and at a look for the payload
    for (int at = 1; at <= asked; ++at) {
        PlayedSource source(frame);
        int question = 0;
        EXPECT_FALSE(readFrame(source, [&] { return ++question == at; })) << at;
        EXPECT_EQ(question, at);
        EXPECT_EQ(source.open, 0) << at;
    }
}

} // namespace
} // namespace tavi
