#include "comparison.h"

#include <algorithm>
#include <chrono>
#include <cstdio>

namespace Shapes {

namespace {

using std::string;

std::vector<string> SplitLines(const string& text)
{
    std::vector<string> lines;
    for (std::size_t at = 0, end = 0; at < text.size(); at = end + 1) {
        end = std::min(text.find('\n', at), text.size());
        lines.push_back(text.substr(at, end - at));
    }
    return lines;
}

// Control characters and what is not ASCII as "\x1f".
string Printable(const string& text)
{
    constexpr const char* Digits = "0123456789abcdef";
    string shown;
    for (const char character : text) {
        const auto byte = static_cast<unsigned char>(character);
        if (byte >= 0x20 && byte < 0x7f) {
            shown += character;
        } else {
            shown += string("\\x") + Digits[byte / 16U] + Digits[byte % 16U];
        }
    }
    return shown;
}

// The lines of both, with "-" and "+" from the first one that differs to the last one.
string Compare(const string& without, const string& with)
{
    const std::vector<string> left = SplitLines(without);
    const std::vector<string> right = SplitLines(with);
    const auto first = std::mismatch(left.begin(), left.end(), right.begin(), right.end());
    const auto last = std::mismatch(left.rbegin(), std::make_reverse_iterator(first.first),
                                    right.rbegin(), std::make_reverse_iterator(first.second));
    string text;
    const auto add = [&text](const char* mark, auto from, auto to) {
        for (; from != to; ++from) text += mark + Printable(*from) + "\n";
    };
    add("    ", left.begin(), first.first);
    add("  - ", first.first, last.first.base());
    add("  + ", first.second, last.second.base());
    add("    ", last.first.base(), left.end());
    return text;
}

void Show(const Operation& operation, const string& outcome)
{
    std::puts(Printable(operation.text).c_str());
    for (const string& line : SplitLines(outcome)) std::puts(("    " + Printable(line)).c_str());
}

Script WithoutRange(const Script& script, std::size_t from, std::size_t count)
{
    Script shorter = script;
    const auto begin = shorter.operations.begin() + static_cast<std::ptrdiff_t>(from);
    const std::size_t present = std::min(count, shorter.operations.size() - from);
    shorter.operations.erase(begin, begin + static_cast<std::ptrdiff_t>(present));
    return shorter;
}

}  // namespace

Comparison::Comparison(const string& directory, Fault fault)
    : plain_(directory + "/plain"), tested_(directory + "/tested"), fault_(fault)
{
}

std::optional<Difference> Comparison::Run(const Script& script, std::size_t count)
{
    plain_.Begin(script.schema, script.limits, {false, false, false});
    tested_.Begin(script.schema, script.limits, script.shortcuts);
    const std::size_t end = std::min(count, script.operations.size());
    for (std::size_t at = 0; at < end; ++at) {
        ++operations_;
        const std::uint64_t seed = script.seed * 1000 + at;
        Difference found{at + 1, plain_.Run(script.operations[at], seed), {}};
        if (isShowing_) Show(script.operations[at], found.without);
        fault_.Activate(true);
        found.with = tested_.Run(script.operations[at], seed);
        fault_.Activate(false);
        if (found.without != found.with) return found;
    }
    Difference found{end + 1, plain_.End(), tested_.End()};
    if (found.without != found.with) return found;
    return std::nullopt;
}

Script Comparison::Shrink(Script script, Difference& difference)
{
    constexpr auto Patience = std::chrono::seconds(60);
    const auto deadline = std::chrono::system_clock::now() + Patience;
    const auto cut = [&] {
        script.operations.resize(std::min(difference.operation, script.operations.size()));
    };
    cut();
    for (std::size_t size = script.operations.size() / 2; size > 0; size /= 2) {
        for (std::size_t at = 0; at < script.operations.size();) {
            if (std::chrono::system_clock::now() > deadline) return script;
            const Script shorter = WithoutRange(script, at, size);
            const std::optional<Difference> found = Run(shorter, shorter.operations.size());
            if (found) {
                script = shorter;
                difference = *found;
                cut();
            } else {
                at += size;
            }
        }
    }
    return script;
}

string Report(const Script& script, const Difference& difference)
{
    string text = Describe(script) + "\n";
    for (std::size_t at = 0; at < difference.operation && at < script.operations.size(); ++at)
        text += std::to_string(at + 1) + ". " + Printable(script.operations[at].text) + "\n";
    if (difference.operation > script.operations.size()) text += "the files at the end\n";
    return text + "without shortcuts (-), and with them (+):\n" +
           Compare(difference.without, difference.with);
}

}  // namespace Shapes
