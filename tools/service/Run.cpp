#include "Run.h"

#include <optional>
#include <vector>

#include "CommandServer.h"
#include "common/Commands.h"
#include "common/Text.h"
#include "Restorer.h"
#include "StatusServer.h"

namespace service {
namespace {

using tools::Arguments;
using tools::toNumber;

constexpr DWORD kIdlePollMs = 50;
constexpr DWORD kHostileMs = 100;

// The pipes and the restores: they end at a restart and begin again.
struct Session {
    Session(const Installation& installation, const RestoreSettings& settings)
        : restorer(installation, settings, status), commands([this] { return restorer.cancel(); })
    {
    }
    StatusServer status;
    Restorer restorer;
    CommandServer commands;
};

class Service {
  public:
    Service(std::int64_t bytesPerSecond, std::int64_t searchMs)
    {
        settings_.bytesPerSecond = bytesPerSecond;
        settings_.searchMs = static_cast<std::uint64_t>(searchMs);
    }

    void work()
    {
        tools::Commands commands(commandTable());
        session_.emplace(installation_, settings_);
        tools::print(L"ready");
        while (!stopped_ && commands.runNext() != tools::Commands::Step::endOfInput) {
        }
    }

  private:
    std::vector<tools::Command> commandTable()
    {
        using A = const Arguments&;
        return {
            {L"rate", L"BYTES_PER_SECOND", 1, 1, [this](A a) { settings_.bytesPerSecond = toNumber(a[0]); }},
            {L"garbage", L"KIND", 1, 1, [this](A a) { session_.value().status.sendGarbage(a[0]); }},
            // Sends every kind of garbage in turn.
            {L"hostile", L"SECONDS", 1, 1, [this](A a) { beHostile(toNumber(a[0])); }},
            {L"restart", L"MS_AWAY", 1, 1, [this](A a) { restart(toNumber(a[0])); }},
            // Waits until nothing is requested any more.
            {L"wait-idle", L"SECONDS", 1, 1, [this](A a) { waitUntilIdle(toNumber(a[0])); }},
            {L"stop", L"", 0, 0, [this](A) { stopped_ = true; }},
        };
    }

    void beHostile(std::int64_t seconds)
    {
        for (const DWORD start = GetTickCount(); GetTickCount() - start < seconds * 1000; Sleep(kHostileMs))
            session_.value().status.sendNextGarbage();
    }

    void restart(std::int64_t milliseconds)
    {
        session_.reset();
        Sleep(static_cast<DWORD>(milliseconds));
        session_.emplace(installation_, settings_);
    }

    void waitUntilIdle(std::int64_t seconds)
    {
        for (const DWORD start = GetTickCount(); !session_.value().restorer.isIdle(); Sleep(kIdlePollMs)) {
            if (GetTickCount() - start >= seconds * 1000)
                throw tools::Failure{L"still at work"};
        }
    }

    const Installation installation_ = findInstallation();
    RestoreSettings settings_;
    std::optional<Session> session_;
    bool stopped_ = false;
};

} // namespace

void run(std::int64_t bytesPerSecond, std::int64_t searchMs)
{
    Service(bytesPerSecond, searchMs).work();
}

} // namespace service
