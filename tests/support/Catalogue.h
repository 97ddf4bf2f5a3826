#pragma once

#include <fstream>
#include <string>

#include <windows.h>
#include <wx/translation.h>

namespace tavi::test {

// Puts a message catalogue of one text into a folder and in force until the end of its life.
struct Catalogue {
    Catalogue(const std::wstring& folder, const std::string& text, const std::string& translation)
    {
        // The file form of gettext: a header, the length and offset of either text, the texts.
        const auto length = static_cast<unsigned>(text.size()), after = static_cast<unsigned>(translation.size());
        const unsigned head[] = {0x950412de, 0, 1, 28, 36, 0, 0, length, 44, after, 45 + length};
        CreateDirectoryW((folder + L"\\de").c_str(), nullptr);
        std::ofstream((folder + L"\\de\\tavi.mo").c_str(), std::ios::binary)
            << std::string(reinterpret_cast<const char*>(head), sizeof(head)) << text << '\0' << translation << '\0';
        wxFileTranslationsLoader::AddCatalogLookupPathPrefix(folder);
        wxTranslations::Set(new wxTranslations);
        wxTranslations::Get()->SetLanguage("de");
        wxTranslations::Get()->AddCatalog("tavi", wxLANGUAGE_ENGLISH);
    }
    ~Catalogue()
    {
        wxTranslations::Set(nullptr);
    }
};

} // namespace tavi::test
