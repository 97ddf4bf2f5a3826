#include "link/MessageReader.h"

#include <deque>

#include <gtest/gtest.h>

#include "tests/link/Frames.h"

using namespace tavi;

namespace {

using test::bytes;

// A peer that sends the parts and closes the pipe. After each part, and at an empty one, one look finds nothing.
struct Peer : ByteSource {
    explicit Peer(std::deque<std::string> sent) : parts(std::move(sent)) {}
    bool peek(std::uint32_t& available) override
    {
        available = parts.empty() ? 0 : static_cast<std::uint32_t>(parts[0].size());
        return !parts.empty();
    }
    void pause() override
    {
        ++pauses;
        if (!parts.empty() && parts[0].empty())
            parts.pop_front();
    }
    bool read(unsigned char* into, std::uint32_t size) override
    {
        largestRead = std::max(largestRead, size);
        parts[0].erase(0, parts[0].copy(reinterpret_cast<char*>(into), size));
        return true;
    }
    std::deque<std::string> parts;
    int pauses = 0;
    std::uint32_t largestRead = 0;
};

const std::string kHead = bytes("34000000 14000000"), kBody(20, '\0');

TEST(MessageReader, ReadsOneFrameOrNone)
{
    // Whether there is a message, the pauses and the largest read.
    const std::tuple<const char*, std::deque<std::string>, bool, int, std::uint32_t> cases[] = {
        {"a frame in two parts", {kHead, kBody}, true, 2, 20},
        {"a payload cut short, the rest reading as zeros", {kHead + "abc", "x"}, true, 1, 20},
        {"nothing", {}, false, 0, 0},
        {"a header cut short", {kHead.substr(0, 5)}, false, 2, 8},
        {"no payload", {kHead}, false, 2, 8},
        {"an announced length of 0", {bytes("34000000 00000000") + kBody}, false, 1, 8},
        {"an unknown type", {bytes("1e000000 14000000") + kBody}, false, 1, 20},
        {"a length of 0xffffffff", {bytes("34000000 ffffffff") + kBody}, true, 1, 1024},
        {"a length that is there", {bytes("34000000 00002000") + std::string(0x200000, '\0')}, true, 1, 0x200000}};
    for (const auto& [what, parts, isRead, pauses, largestRead] : cases) {
        Peer peer(parts);
        EXPECT_EQ(readFrame(peer, nullptr) != nullptr, isRead) << what;
        EXPECT_EQ(peer.pauses, pauses) << what;
        EXPECT_EQ(peer.largestRead, largestRead) << what;
    }
}

TEST(MessageReader, GivesUpAtEveryCheck)
{
    // 1 and 2: while the header is awaited; 3: after it; 4: while the payload is awaited; 5: never.
    for (int stopAt = 1; stopAt <= 5; ++stopAt) {
        Peer peer({"", kHead, kBody});
        int checks = 0;
        EXPECT_EQ(readFrame(peer, [&] { return ++checks == stopAt; }) != nullptr, stopAt == 5) << stopAt;
        EXPECT_EQ(checks, std::min(stopAt, 4));
    }
}

} // namespace
