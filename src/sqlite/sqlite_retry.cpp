#include "sqlite/sqlite_retry.h"

#include <optional>
#include <utility>

#include <orvadrcore/utils.h>

#include "base/json_helpers.h"
#include "base/retry.h"

namespace OrvaDRCore {

namespace {

// Random, so that competing writers do not meet again.
constexpr unsigned int MinPauseMSec = 500;
constexpr unsigned int MaxPauseMSec = 1000;

}  // namespace

Attempts RunWithRetries(SqliteError& error, unsigned int limit,
                        const std::function<bool()>& attempt,
                        const std::function<bool()>& mayRepeat)
{
    std::optional<Json::Value> entries;  // most operations succeed, and need none
    const auto attemptAndNote = [&] {
        error.Set(0);
        if (attempt()) return true;
        if (!entries) entries.emplace();
        entries->append(error.AsEntry());
        return false;
    };
    const auto pause = [] { RandomSleepInMSec(MinPauseMSec, MaxPauseMSec); };
    const RetryOutcome outcome = Retry(limit, attemptAndNote, pause, mayRepeat);

    Attempts attempts{outcome.succeeded, static_cast<unsigned int>(outcome.failures), {}};
    if (outcome.failures > 0) attempts.errors = toString(*entries);
    if (!outcome.succeeded) error.SetFailures(std::move(*entries));
    return attempts;
}

}  // namespace OrvaDRCore
