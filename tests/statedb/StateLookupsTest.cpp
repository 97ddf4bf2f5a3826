#include "statedb/StateLookups.h"

#include <optional>

#include <gtest/gtest.h>

#include "tests/support/Allocations.h"
#include "tests/support/Registry.h"

namespace tavi {
namespace {

TEST(StateLookups, FoldersInheritFromTheNearestRecordedOne)
{
    test::InstalledService service;
    DbConnection writer;
    writer.open(service.file(L"taviconf.dat"));
    EXPECT_THROW(FolderStateTable(), DbException);
    writer.execDML("CREATE TABLE filesystem(state INTEGER, folder TEXT PRIMARY KEY)");
    for (int state = -1; state <= 16; ++state)
        writer.execDML(wxString::Format(L"INSERT INTO filesystem VALUES(%d,'C:\\s%d')", state, state));
    writer.execDML("INSERT INTO filesystem VALUES(NULL,'C:\\null'),(4,'D:')");
    FolderStateTable states;
    const auto stateOf = [&](const wxString& folder) { return static_cast<int>(states.getFolderState(folder)); };
    for (int state = -1; state <= 16; ++state) {
        const wxString folder = wxString::Format(L"C:\\s%d", state);
        const int passedOn = state == 0 || state == 2 ? 8 : state == 1 || state == 3 || state == 5 ? 7 : state;
        EXPECT_EQ(stateOf(folder), state);
        EXPECT_EQ(stateOf(folder + L"\\x"), passedOn) << state;
        EXPECT_EQ(stateOf(folder + L"\\x\\y\\"), passedOn) << state;
    }
    EXPECT_EQ(stateOf(L"C:\\S2") + stateOf(L"E:\\a\\b") + stateOf(L""), 24);
    EXPECT_EQ(stateOf(L"C:\\null"), 0);
    EXPECT_EQ(stateOf(L"D:\\any"), 4);

    // Connected, but not locked: the service can write.
    EXPECT_EQ(writer.execDML("UPDATE filesystem SET state=5 WHERE folder='C:\\s6'"), 1);
    EXPECT_EQ(stateOf(L"C:\\s6"), 5);
    EXPECT_EQ(stateOf(L"C:\\s6\\x"), 7);
    writer.execDML("UPDATE filesystem SET state=2 WHERE folder='C:\\s6'");
    std::optional<FolderStateTable::ReadScope> reading(std::in_place, states);
    EXPECT_EQ(stateOf(L"C:\\s6\\x"), 8) << "the state before is not remembered";
    EXPECT_EQ(stateOf(L"C:\\s4\\y"), 4);
    {
        const test::FailingAllocations failing(0); // the end unlocks without memory
        reading.reset();
    }
    EXPECT_EQ(writer.execDML("UPDATE filesystem SET state=5 WHERE folder='C:\\s6'"), 1);
}

} // namespace
} // namespace tavi
