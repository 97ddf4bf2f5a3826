#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "manifest/ManifestBuilder.h"

namespace tavi {

// Parses the manifest text as its bytes arrive. The text is well-formed UTF-8, in which surrogates may have their
// three-byte form; slices may end anywhere. One thread.
class ManifestParser {
  public:
    ManifestParser();

    // Parses the next slice; a zero byte must follow its bytes. After an invalid line, which is logged, slices are
    // ignored.
    void feed(const char* bytes, std::size_t length);
    // Ends the text, whose length in UTF-16 units is `units`. Returns null if a line was invalid.
    ManifestRef finish(std::uint32_t units);

  private:
    enum class Section { header, user, files, skipped };

    const char* feedVersions(const char* at, const char* end);
    void carry(std::string_view part);
    void endLine(std::string_view line);
    void endSection();
    void endUserSection();
    void addFileLine(std::string_view line, bool isLast);
    void addPatchLine(std::string_view line);
    bool addPatch(std::string_view line);
    void endFile();

    // Empty after an invalid line.
    std::optional<ManifestBuilder> builder_;
    Section section_ = Section::header;
    // The newlines directly before the current line, within its section.
    unsigned newlines_ = 0;
    // The part of the current line that was in earlier slices.
    std::string carry_;
    std::string userText_;
    std::string path_;
    bool hasPath_ = false;
    std::uint32_t firstVersion_ = 0;
};

} // namespace tavi
