#include "manifest/StoredManifest.h"

#include <algorithm>
#include <cstring>
#include <memory>
#include <new>
#include <utility>

#include <zlib.h>

#include "core/LogLine.h"
#include "core/Utf8.h"
#include "manifest/ManifestParser.h"

namespace tavi {
namespace {

constexpr std::size_t kReadBytes = 64 * 1024;
// So large that the heap takes each piece from the system and returns it at once; with the heap's header, 1 MB.
constexpr std::size_t kPieceBytes = 1024 * 1024 - 64;

// The first bytes of a character that is cut in two.
struct PartialSequence {
    char bytes[3];
    unsigned char count;
};

// One for the process, not one for each text: the bytes that are left at the end of one stored manifest begin the next.
// Every reader of the format keeps them so, and the module must decode each text as the others do.
PartialSequence leftOver{};

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
    // `before` precedes the text.
    TextDecoder(ManifestParser& parser, PartialSequence before)
        : parser_(parser), buffer_(new char[sizeof before.bytes + kReadBytes + 1]), pending_(before)
    {
    }

    // Returns where the next slice, of at most kReadBytes, is read to.
    char* slice() noexcept
    {
        return buffer_.get() + sizeof pending_.bytes;
    }
    // Decodes the slice. Returns false at a malformed sequence, which ends the text.
    bool decodeSlice(std::size_t length);
    // Returns the bytes behind the last whole character.
    PartialSequence pending() const noexcept
    {
        return pending_;
    }
    std::uint32_t units() const noexcept
    {
        return units_;
    }

  private:
    void pass(char* begin, char* end);

    ManifestParser& parser_;
    std::unique_ptr<char[]> buffer_;
    PartialSequence pending_;
    std::uint32_t units_ = 0;
    bool hasEnded_ = false;
};

bool TextDecoder::decodeSlice(std::size_t length)
{
    using Form = Utf8Sequence::Form;
    const char* const end = slice() + length;
    char* const begin = slice() - pending_.count;
    std::copy_n(pending_.bytes, pending_.count, begin);
    auto form = Form::whole;
    char* at = begin;
    while ((at = skipAsciiWords(at, end)) != end) {
        const Utf8Sequence sequence = decodeUtf8({at, static_cast<std::size_t>(end - at)});
        form = sequence.form;
        if (form != Form::whole)
            break;
        // Decoding continues behind a zero, since the bytes at the end may begin the next text.
        if (sequence.point == 0 && !hasEnded_) {
            pass(begin, at);
            hasEnded_ = true;
        }
        // A character of four bytes has two UTF-16 units, any other one.
        if (!hasEnded_)
            units_ -= static_cast<std::uint32_t>(sequence.length == 4 ? 2 : sequence.length - 1);
        at += sequence.length;
    }
    pending_.count = form == Form::truncated ? static_cast<unsigned char>(end - at) : 0;
    std::copy_n(at, pending_.count, pending_.bytes);
    if (!hasEnded_)
        pass(begin, at);
    return form != Form::malformed;
}

void TextDecoder::pass(char* begin, char* end)
{
    *end = 0;
    const auto length = static_cast<std::size_t>(end - begin);
    units_ += static_cast<std::uint32_t>(length);
    parser_.feed(begin, length);
}

// Inflates a blob. wxZlibInputStream reports that memory ran out as if the blob were damaged, and only after it has
// formatted a log line.
class Inflater {
  public:
    explicit Inflater(const BlobPieces& blob) : next_(blob.begin()), end_(blob.end())
    {
        constexpr int kZlibOrGzip = 32;
        check(inflateInit2(&stream_, MAX_WBITS + kZlibOrGzip));
    }
    Inflater(const Inflater&) = delete;
    Inflater& operator=(const Inflater&) = delete;
    ~Inflater()
    {
        inflateEnd(&stream_);
    }
    // Returns how many bytes it wrote: fewer than `capacity` at the end of the data, or where they are damaged.
    std::size_t read(char* to, std::size_t capacity)
    {
        stream_.next_out = reinterpret_cast<Bytef*>(to);
        stream_.avail_out = static_cast<uInt>(capacity);
        int result = Z_OK;
        while (result == Z_OK && stream_.avail_out != 0) {
            if (stream_.avail_in == 0 && next_ != end_) {
                // zlib does not write to it.
                stream_.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(next_->data()));
                stream_.avail_in = static_cast<uInt>(next_->size());
                ++next_;
            }
            result = inflate(&stream_, Z_SYNC_FLUSH);
        }
        check(result);
        return capacity - stream_.avail_out;
    }

  private:
    static void check(int result)
    {
        if (result == Z_MEM_ERROR)
            throw std::bad_alloc();
        if (result != Z_OK && result != Z_STREAM_END)
            logError(L"The stored manifest is damaged (%d: %hs)", result, zError(result));
    }

    z_stream stream_{};
    BlobPieces::const_iterator next_, end_;
};

} // namespace

BlobPieces piecesOf(std::string_view blob)
{
    BlobPieces pieces;
    for (; !blob.empty(); blob.remove_prefix(pieces.back().size()))
        pieces.emplace_back(blob.substr(0, kPieceBytes));
    return pieces;
}

ManifestRef parseStoredManifest(const BlobPieces& blob)
{
    ManifestParser parser;
    TextDecoder decoder(parser, std::exchange(leftOver, {}));
    if (!blob.empty()) {
        Inflater text(blob);
        for (std::size_t count = kReadBytes; count == kReadBytes;) {
            count = text.read(decoder.slice(), kReadBytes);
            if (!decoder.decodeSlice(count))
                break;
        }
    }
    ManifestRef manifest = parser.finish(decoder.units());
    // Only now: a parse that runs out of memory must not leave bytes of its text to the next.
    leftOver = decoder.pending();
    return manifest;
}

} // namespace tavi
