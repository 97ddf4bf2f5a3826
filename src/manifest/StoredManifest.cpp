#include "manifest/StoredManifest.h"

#include <atomic>
#include <memory>

#include <wx/mstream.h>
#include <wx/zstream.h>

#include "manifest/ManifestParser.h"

namespace tavi {
namespace {

constexpr std::size_t kReadSize = 64 * 1024;
constexpr std::size_t kLongestPending = 3;

// The first bytes of a character that a write cut in two; the last byte of the word counts them. One for the process,
// not one for each text: what is left at the end of one stored manifest begins the next. The format's readers have it
// so.
std::atomic<std::uint32_t> pendingBytes{0};

std::uint32_t packPending(const char* bytes, std::size_t count) noexcept
{
    std::uint32_t word = static_cast<std::uint32_t>(count) << 24;
    for (std::size_t i = 0; i < count; ++i)
        word |= std::uint32_t{static_cast<unsigned char>(bytes[i])} << (8 * i);
    return word;
}

// Counts the continuation bytes that a lead byte announces; -1 for a byte that leads nothing.
int announced(unsigned char lead) noexcept
{
    return lead < 0x80 ? 0 : lead < 0xC0 ? -1 : lead < 0xE0 ? 1 : lead < 0xF0 ? 2 : lead < 0xF8 ? 3 : -1;
}

// Checks UTF-8 as it is written and hands the text, up to its first zero, to the parser.
class TextDecoder {
  public:
    explicit TextDecoder(ManifestParser& parser) : parser_(parser), buffer_(new char[kLongestPending + kReadSize + 1])
    {
    }

    // Where the next write's bytes, up to kReadSize, go.
    char* room() noexcept
    {
        return buffer_.get() + kLongestPending;
    }
    // False when the text has ended in a fault.
    bool write(std::size_t length);
    std::uint32_t units() const noexcept
    {
        return units_;
    }

  private:
    void pass(char* begin, char* end);

    ManifestParser& parser_;
    std::unique_ptr<char[]> buffer_;
    std::uint32_t units_ = 0;
    bool ended_ = false;
};

bool TextDecoder::write(std::size_t length)
{
    char* const end = room() + length;
    const std::uint32_t pending = pendingBytes.exchange(0);
    char* const begin = room() - (pending >> 24);
    for (char* to = begin; to != room(); ++to)
        *to = static_cast<char>(pending >> (8 * (to - begin)));

    const auto byteAt = [](const char* at) { return static_cast<unsigned char>(*at); };
    // Units that are not one to a byte.
    std::uint32_t fewer = 0;
    char* zero = nullptr;
    char* at = begin;
    bool sound = true;
    while (at != end) {
        constexpr std::uint32_t kOnes = 0x01010101u;
        for (std::uint32_t word = 0; end - at >= 4; at += 4) {
            std::memcpy(&word, at, sizeof word);
            // All of them ASCII and none zero.
            if ((((word - kOnes) | word) & (kOnes << 7)) != 0)
                break;
        }
        if (at == end)
            break;
        const int tails = announced(byteAt(at));
        if (tails == 0) {
            if (*at == 0 && !zero)
                zero = at;
            ++at;
            continue;
        }
        sound = tails > 0;
        std::uint32_t point = byteAt(at) & (0x3Fu >> (sound ? tails : 0));
        int have = 1;
        for (; sound && have <= tails && at + have != end; ++have) {
            sound = (byteAt(at + have) & 0xC0) == 0x80;
            point = point << 6 | (byteAt(at + have) & 0x3Fu);
        }
        if (sound && have <= tails) {
            pendingBytes = packPending(at, static_cast<std::size_t>(have));
            break;
        }
        constexpr std::uint32_t kSmallest[] = {0, 0x80, 0x800, 0x10000};
        sound = sound && point >= kSmallest[tails] && point <= 0x10FFFF;
        if (!sound)
            break;
        // Two units for a character of four bytes, one for any shorter.
        if (!zero)
            fewer += tails == 3 ? 2u : static_cast<std::uint32_t>(tails);
        at += tails + 1;
    }
    // What follows a zero is still decoded, since its end may be the next text's beginning.
    if (!ended_) {
        pass(begin, zero ? zero : at);
        units_ -= fewer;
        ended_ = zero != nullptr;
    }
    return sound;
}

void TextDecoder::pass(char* begin, char* end)
{
    *end = 0;
    const auto length = static_cast<std::size_t>(end - begin);
    units_ += static_cast<std::uint32_t>(length);
    parser_.feed(begin, length);
}

} // namespace

ManifestRef parseStoredManifest(const void* bytes, std::size_t length)
{
    ManifestParser parser;
    TextDecoder decoder(parser);
    if (length != 0) {
        wxMemoryInputStream packed(bytes, length);
        wxZlibInputStream text(packed, wxZLIB_AUTO);
        for (bool more = true; more;) {
            const std::size_t count = text.Read(decoder.room(), kReadSize).LastRead();
            more = count != 0 && decoder.write(count);
        }
    }
    return parser.finish(decoder.units());
}

} // namespace tavi
