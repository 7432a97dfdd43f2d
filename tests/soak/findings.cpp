#include "findings.h"

namespace Soak {

namespace {

constexpr std::size_t MaxShown = 8;

}  // namespace

const char* WordsOf(Promise promise)
{
    switch (promise) {
        case Promise::Answers: return "every answer is right";
        case Promise::Stored: return "confirmed changes are stored, once, and nothing else";
        case Promise::Integrity: return "the database is intact";
        case Promise::Refreshes: return "the status is refreshed, and no refresh hangs";
        case Promise::Waits: return "no request waits too long";
        case Promise::Starvation: return "no client starves";
        case Promise::Ends: return "processes end when told to, and not before";
        case Promise::Growth: return "processes do not grow";
        case Promise::LeftOvers: return "no lock, pid file or temporary file is left";
    }
    return "";
}

void Findings::Add(Promise promise, const std::string& text)
{
    const std::lock_guard<std::mutex> lock(mutex_);
    texts_[promise].push_back(text);
}

std::vector<std::string> Findings::Of(Promise promise) const
{
    const std::lock_guard<std::mutex> lock(mutex_);
    const auto found = texts_.find(promise);
    if (found == texts_.end()) return {};
    std::vector<std::string> shown = found->second;
    if (shown.size() > MaxShown) {
        const std::size_t more = shown.size() - MaxShown;
        shown.resize(MaxShown);
        shown.push_back("... and " + std::to_string(more) + " more");
    }
    return shown;
}

bool Findings::IsEmpty() const
{
    const std::lock_guard<std::mutex> lock(mutex_);
    return texts_.empty();
}

}  // namespace Soak
