#include "statedb/StateLookups.h"

#include <optional>

#include <gtest/gtest.h>

#include "tests/support/Allocations.h"
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
        EXPECT_EQ(stateOf(folder + L"\\x"), passedOn) << state;
        EXPECT_EQ(stateOf(folder + L"\\x\\y\\"), passedOn) << state;
    }
    EXPECT_EQ(stateOf(L"C:\\S2") + stateOf(L"E:\\a\\b") + stateOf(L""), 24);
    EXPECT_TRUE(stateOf(L"C:\\null") == 0 && stateOf(L"D:\\any") == 4);

    writer.execDML("UPDATE filesystem SET state=2 WHERE folder='C:\\s6'"); // connected, but not locked
    std::optional<FolderStateTable::ReadScope> reading(std::in_place, states);
    EXPECT_EQ(stateOf(L"C:\\s6\\x"), 8) << "the state before is not remembered";
    EXPECT_EQ(stateOf(L"C:\\s4\\y"), 4);
    test::FailingAllocations(0), reading.reset(); // the end unlocks without memory
    EXPECT_EQ(writer.execDML("UPDATE filesystem SET state=5 WHERE folder='C:\\s6'"), 1);
    EXPECT_EQ(stateOf(L"C:\\s6\\x"), 7);
}
