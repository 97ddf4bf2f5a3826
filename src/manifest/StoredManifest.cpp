#include "manifest/StoredManifest.h"

#include <atomic>
#include <cstring>
#include <memory>
#include <string_view>

#include <wx/mstream.h>
#include <wx/zstream.h>

#include "core/Utf8.h"
#include "manifest/ManifestParser.h"

namespace tavi {
namespace {

constexpr std::size_t kReadBytes = 64 * 1024;
constexpr std::size_t kMaxPendingBytes = 3;

// The first bytes of a character that a read cut in two; the top byte is their number. One for the process, not one for
// each text: the bytes that are left at the end of one stored manifest begin the next. Every reader of the format
// keeps them so, and the module must decode each text as the others do.
std::atomic<std::uint32_t> pendingBytes{0};

std::uint32_t packPending(std::string_view bytes) noexcept
{
    auto word = static_cast<std::uint32_t>(bytes.size()) << 24;
    for (std::size_t i = 0; i < bytes.size(); ++i)
        word |= std::uint32_t{static_cast<unsigned char>(bytes[i])} << (8 * i);
    return word;
}

// Moves the pending bytes directly before `text` and returns where they start.
char* prependPending(char* text) noexcept
{
    const std::uint32_t pending = pendingBytes.exchange(0);
    char* const begin = text - (pending >> 24);
    for (char* to = begin; to != text; ++to)
        *to = static_cast<char>(pending >> (8 * (to - begin)));
    return begin;
}

// Skips ASCII characters other than zero, a word at a time.
char* skipAsciiWords(char* at, const char* end) noexcept
{
    constexpr std::uint32_t kOnes = 0x01010101u;
    for (std::uint32_t word = 0; end - at >= 4; at += 4) {
        std::memcpy(&word, at, sizeof word);
        if ((((word - kOnes) | word) & (kOnes << 7)) != 0)
            break;
    }
    return at;
}

// Decodes a text in slices and passes it, up to its first zero, to the parser.
class TextDecoder {
  public:
    explicit TextDecoder(ManifestParser& parser) : parser_(parser), buffer_(new char[kMaxPendingBytes + kReadBytes + 1])
    {
    }

    // Returns where the next slice, of at most kReadBytes, is read to.
    char* slice() noexcept
    {
        return buffer_.get() + kMaxPendingBytes;
    }
    // Decodes the slice. Returns false at a malformed sequence, which ends the text.
    bool decodeSlice(std::size_t length);
    std::uint32_t units() const noexcept
    {
        return units_;
    }

  private:
    void pass(char* begin, char* end, std::uint32_t surplusBytes);

    ManifestParser& parser_;
    std::unique_ptr<char[]> buffer_;
    std::uint32_t units_ = 0;
    bool hasEnded_ = false;
};

bool TextDecoder::decodeSlice(std::size_t length)
{
    const char* const end = slice() + length;
    char* const begin = prependPending(slice());
    char* zero = nullptr;
    // Bytes beyond one for each UTF-16 unit: a character of four bytes has two units, any other one.
    std::uint32_t surplusBytes = 0;
    auto form = Utf8Sequence::Form::whole;
    char* at = begin;
    while ((at = skipAsciiWords(at, end)) != end) {
        const std::string_view rest(at, static_cast<std::size_t>(end - at));
        const Utf8Sequence sequence = decodeUtf8(rest);
        form = sequence.form;
        if (form == Utf8Sequence::Form::truncated)
            pendingBytes = packPending(rest);
        if (form != Utf8Sequence::Form::whole)
            break;
        if (sequence.point == 0 && !zero)
            zero = at;
        if (!zero)
            surplusBytes += static_cast<std::uint32_t>(sequence.length == 4 ? 2 : sequence.length - 1);
        at += sequence.length;
    }
    // Decoding continues behind a zero, since the bytes at the end may begin the next text.
    if (!hasEnded_)
        pass(begin, zero ? zero : at, surplusBytes);
    hasEnded_ = hasEnded_ || zero;
    return form != Utf8Sequence::Form::malformed;
}

void TextDecoder::pass(char* begin, char* end, std::uint32_t surplusBytes)
{
    *end = 0;
    const auto length = static_cast<std::size_t>(end - begin);
    units_ += static_cast<std::uint32_t>(length) - surplusBytes;
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
            const std::size_t count = text.Read(decoder.slice(), kReadBytes).LastRead();
            more = count != 0 && decoder.decodeSlice(count);
        }
    }
    return parser.finish(decoder.units());
}

} // namespace tavi
