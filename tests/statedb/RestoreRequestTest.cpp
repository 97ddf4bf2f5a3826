#include "statedb/RestoreRequest.h"

#include <ctime>
#include <thread>

#include <gtest/gtest.h>

#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

class RestoreRequests : public testing::Test {
  protected:
    RestoreRequests()
    {
        const Manifest* manifest = Manifest::Parse(wxString(L"FILES\nC:\\one\\a.txt\n100:1:4000000000:5:0:x:0:40\n\n"
                                                            L"C:\\one\\b.txt\n100:1:2:6:0:x:0:41"));
        manifest->AddRef();
        manifest_ = ManifestRef(manifest);
        database_.open(service_.file(L"tavistate.dat"));
        database_.execDML("CREATE TABLE restores(request_time INTEGER, machine_id TEXT, machine_alias TEXT, "
                          "encryption_key TEXT);"
                          "CREATE TABLE restore_files(restore_id, manifest_path, file_size, timestamp, ctime, "
                          "attributes, target_path, overwrite)");
    }
    // Returns what was logged.
    std::string perform(const wchar_t* selected)
    {
        RestoreRequest request;
        request.selectedPaths.insert(selected);
        request.cutoffTime = 100;
        request.overwrite = true;
        performRestore(request, *manifest_);
        EXPECT_TRUE(request.selectedPaths.empty());
        std::string logged;
        for (const std::string& line : log_.take())
            logged += line;
        return logged;
    }
    int count(const char* sql)
    {
        DbQuery rows = database_.execQuery(sql);
        return rows.nextRow() ? rows.fieldInt(0, -1) : -2;
    }

    test::LogCapture log_;
    test::InstalledService service_;
    DbConnection database_;
    ManifestRef manifest_;
};

TEST_F(RestoreRequests, StandInTheDatabaseAsOneTransaction)
{
    const auto start = static_cast<int>(std::time(nullptr));
    EXPECT_EQ(perform(L"C:\\one"), "");
    EXPECT_EQ(perform(L"C:\\nothing there"), "");
    EXPECT_EQ(count("SELECT count(*) FROM restores"), 2); // one without files is stored as well
    EXPECT_EQ(count("SELECT count(*) FROM restore_files WHERE restore_id=1"), 2);
    EXPECT_GE(count("SELECT min(request_time) FROM restores"), start);
    EXPECT_LE(count("SELECT max(request_time) FROM restores"), static_cast<int>(std::time(nullptr)));
    EXPECT_EQ(count("SELECT count(*) FROM restores WHERE machine_id='' AND machine_alias='' AND encryption_key=''"), 2);
    // Times are bound as signed 32-bit numbers, attributes are octal in the manifest.
    EXPECT_EQ(count("SELECT count(*) FROM restore_files WHERE manifest_path='C:\\one\\a.txt' AND file_size=5 AND "
                    "timestamp=100 AND ctime=-294967296 AND attributes=32 AND target_path='C:\\one\\a.txt' AND "
                    "overwrite=1"),
              1);
}

TEST_F(RestoreRequests, AFailureLeavesNothingHalfWrittenAndOneLine)
{
    const struct {
        const char* breakIt;
        const char* mendIt;
        const char* logged;
    } cases[] = {
        {"CREATE TRIGGER t BEFORE INSERT ON restore_files WHEN new.manifest_path LIKE '%b.txt' BEGIN SELECT "
         "RAISE(ABORT,'no'); END",
         "DROP TRIGGER t", "1: Error: Error requesting restore: DB_CONSTRAINT[19]: no"},
        {"ALTER TABLE restore_files RENAME TO gone", "ALTER TABLE gone RENAME TO restore_files",
         "1: Error: Error requesting restore: DB_ERROR[1]: "},
        {"CREATE TRIGGER t BEFORE INSERT ON restore_files BEGIN SELECT RAISE(ROLLBACK,'all'); END", "DROP TRIGGER t",
         "1: Error: Error requesting restore: DB_CONSTRAINT[19]: all"}, // the library rolls back by itself
    };
    for (const auto& test : cases) {
        database_.execDML(test.breakIt);
        EXPECT_EQ(perform(L"C:\\one"), test.logged);
        EXPECT_EQ(count("SELECT count(*) FROM restores"), 0);
        database_.execDML(test.mendIt);
        EXPECT_EQ(count("SELECT count(*) FROM restore_files"), 0);
    }
    service_.install().SetValue(L"DataPath", wxString(L"C:\\no such folder"));
    EXPECT_EQ(perform(L"C:\\one"),
              "1: Error: Failed to open state db for restores: DB_CANTOPEN[14]: unable to open database file");
}

TEST_F(RestoreRequests, WaitForAnotherWriter)
{
    database_.beginTransaction(2);
    database_.execDML("INSERT INTO restores(request_time) VALUES(7)");
    std::string logged = "not done";
    std::thread other([&] { logged = perform(L"C:\\one"); });
    Sleep(300);
    database_.commitTransaction();
    other.join();
    EXPECT_EQ(logged, "");
    EXPECT_EQ(count("SELECT count(*) FROM restores"), 2);
    EXPECT_EQ(count("SELECT count(*) FROM restore_files"), 2);
}

TEST_F(RestoreRequests, KeepExistingFilesUnlessToldOtherwise)
{
    const std::wstring folder = service_.file(L"kept");
    CreateDirectoryW(folder.c_str(), nullptr);
    for (const wchar_t* name : {L"\\a.txt", L"\\a (1).txt"})
        CloseHandle(CreateFileW((folder + name).c_str(), GENERIC_WRITE, 0, nullptr, CREATE_NEW, 0, nullptr));
    RestoreRequest request;
    request.selectedPaths.insert(L"C:\\one");
    request.cutoffTime = 100;
    request.sourcePrefix = L"C:\\one";
    request.destinationFolder = folder;
    performRestore(request, *manifest_);
    EXPECT_EQ(count("SELECT count(*) FROM restore_files WHERE overwrite=0 AND (target_path LIKE '%\\kept\\a (2).txt' "
                    "OR target_path LIKE '%\\kept\\b.txt')"),
              2);
}

} // namespace
} // namespace tavi
