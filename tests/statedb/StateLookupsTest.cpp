#include "statedb/StateLookups.h"

#include <optional>

#include <gtest/gtest.h>

#include "tests/support/Allocations.h"
#include "tests/support/LogCapture.h"
#include "tests/support/Registry.h"

using namespace tavi;

TEST(StateLookups, FoldersInheritFromTheNearestRecordedOne)
{
    test::InstalledService service;
    DbConnection writer = service.database(L"taviconf.dat");
    EXPECT_THROW(FolderStateTable(), DbException);
    writer.execDML("CREATE TABLE filesystem(state INTEGER, folder TEXT PRIMARY KEY)");
    writer.execDML("INSERT INTO filesystem VALUES(NULL,'C:\\null'),(4,'D:')");
    FolderStateTable states;
    const auto stateOf = [&](const wxString& folder) { return static_cast<int>(states.getFolderState(folder)); };
    for (int state = -1; state <= 16; ++state) {
        const wxString folder = wxString::Format(L"C:\\s%d", state);
        writer.execDML(wxString::Format(L"INSERT INTO filesystem VALUES(%d,'%s')", state, folder));
        const int passedOn = state == 0 || state == 2 ? 8 : state == 1 || state == 3 || state == 5 ? 7 : state;
        EXPECT_EQ(stateOf(folder), state);
        EXPECT_EQ(stateOf(folder + L"\\x\\y\\"), passedOn) << state;
    }
    for (const wchar_t* const unrecorded : {L"C:\\S2", L"E:\\a\\b", L""})
        EXPECT_EQ(stateOf(unrecorded), 8) << unrecorded;
    EXPECT_EQ(stateOf(L"C:\\null"), 0);
    EXPECT_EQ(stateOf(L"D:\\any"), 4);

    writer.execDML("UPDATE filesystem SET state=2 WHERE folder='C:\\s6'"); // connected, but not locked
    std::optional<FolderStateTable::ReadScope> reading(std::in_place, states);
    EXPECT_EQ(stateOf(L"C:\\s6\\x"), 8) << "the state before is not remembered";
    EXPECT_EQ(stateOf(L"C:\\s4\\y"), 4);
    test::FailingAllocations(0), reading.reset(); // the end unlocks without memory
    for (const int state : {4, 6}) {              // no answer is remembered any more
        EXPECT_EQ(writer.execDML(wxString::Format(L"UPDATE filesystem SET state=%d WHERE folder='C:\\s6'", state)), 1);
        EXPECT_EQ(stateOf(L"C:\\s6\\x"), state);
    }
}

TEST(StateLookups, FilesHaveTheirRecordedStateOnly)
{
    test::LogCapture log;
    test::InstalledService service;
    const auto stateOf = [](const wchar_t* path) { return FileStateLookup().getFileState(path); };
    EXPECT_EQ(stateOf(L"C:\\one"), 15);
    EXPECT_EQ(log.takeText(), "1: Error: Failed to retrieve file state (1: DB_ERROR[1]: )");
    service.createTables();
    service.database(L"tavistate.dat").execDML("INSERT INTO file_states VALUES('C:\\one',1),('C:\\null',NULL)");
    EXPECT_EQ(stateOf(L"C:\\one"), 1);
    EXPECT_EQ(stateOf(L"C:\\null"), 0);
    for (const wchar_t* const unrecorded : {L"C:\\One", L"C:\\one\\below", L""})
        EXPECT_EQ(stateOf(unrecorded), 15) << unrecorded;
    EXPECT_EQ(log.takeText(), "");
    service.install().SetValue(L"DataPath", wxString(service.file(L"no folder")));
    EXPECT_EQ(stateOf(L"C:\\one"), 15);
    EXPECT_EQ(log.takeText(),
              "1: Error: Failed to open file-state db (14: DB_CANTOPEN[14]: unable to open database file)");
}
