// Reading files of "key=value" lines into a map. The files are in memory, because a disk would hide
// everything else.
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <cstring>
#include <map>

#include <orvadrcore/file.h>

#include "support/bench.h"
#include "support/by_hand.h"

#if BENCH_HAS_INIH
#include <ini.h>
#endif
#if BENCH_HAS_GLIB
#include <glib.h>
#endif
#if BENCH_HAS_BOOST
#include <boost/property_tree/ini_parser.hpp>
#include <boost/property_tree/ptree.hpp>
#endif

namespace Bench {

namespace {

std::string Lines(int count, const char* head, const std::string& kind)
{
    std::string text = head;
    for (int number = 0; number < count; ++number) {
        text += "key_" + std::to_string(number) + "=";
        if (kind == "text") text += "value-";
        text += std::to_string(number * 7);
        if (kind == "real") text += ".25";
        text += '\n';
    }
    return text;
}

template <class V>
struct KeyValue {
    explicit KeyValue(int count, const char* head = "")
    {
        WriteFile(path, Lines(count, head, Kind()));
    }

    static std::string Kind()
    {
        if (std::is_same_v<V, std::string>) return "text";
        return std::is_same_v<V, int> ? "integer" : "real";
    }

    std::string Result() const
    {
        std::string text;
        for (const auto& [key, value] : pairs) {
            text += key + "=";
            if constexpr (std::is_same_v<V, std::string>) {
                text += value + "\n";
            } else {
                text += std::to_string(value) + "\n";
            }
        }
        return text;
    }

    TempDir dir{Place::Memory};
    std::string path = dir.File("settings.conf");
    std::map<std::string, V> pairs;
};

template <class V>
struct OurPairs : KeyValue<V> {
    using KeyValue<V>::KeyValue;
    void Run() { Require(OrvaDRCore::File::Read(this->path, this->pairs) >= 0, "cannot read"); }
};

template <class V>
V ToValue(std::string_view text)
{
    if constexpr (std::is_same_v<V, std::string>) {
        return V(text);
    } else {
        V value{};
        std::from_chars(text.data(), text.data() + text.size(), value);
        return value;
    }
}

// Calls `take` with each line, without its newline.
template <class Take>
void ForEachLine(std::string_view text, Take take)
{
    while (!text.empty()) {
        const std::size_t end = std::min(text.find('\n'), text.size());
        take(text.substr(0, end));
        text.remove_prefix(std::min(end + 1, text.size()));
    }
}

template <class V>
struct BarePairs : KeyValue<V> {
    using KeyValue<V>::KeyValue;
    void Run()
    {
        const std::string text = ReadFile(this->path);
        this->pairs.clear();
        ForEachLine(text, [this](std::string_view line) {
            const std::size_t at = line.find('=');
            if (at == std::string_view::npos) return;
            this->pairs.emplace(line.substr(0, at), ToValue<V>(line.substr(at + 1)));
        });
    }
};

// Sorts the lines first, so that each pair is appended to the map without a search.
template <class V>
struct SortedPairs : KeyValue<V> {
    using KeyValue<V>::KeyValue;
    void Run()
    {
        const std::string text = ReadFile(this->path);
        this->pairs.clear();
        std::vector<std::pair<std::string_view, std::string_view>> lines;
        ForEachLine(text, [&lines](std::string_view line) {
            const std::size_t at = line.find('=');
            if (at == std::string_view::npos) return;
            lines.emplace_back(line.substr(0, at), line.substr(at + 1));
        });
        std::stable_sort(lines.begin(), lines.end(), [](const auto& one, const auto& other) {
            return one.first < other.first;
        });
        for (const auto& [key, value] : lines) {
            this->pairs.emplace_hint(this->pairs.end(), key, ToValue<V>(value));
        }
    }
};

// The first word of a text.
std::string_view FirstWord(std::string_view text)
{
    constexpr const char* Blanks = " \t\n\v\f\r";
    const std::size_t begin = std::min(text.find_first_not_of(Blanks), text.size());
    return text.substr(begin, std::min(text.find_first_of(Blanks, begin), text.size()) - begin);
}

// Takes the first word of each side. A line with an empty side is skipped. A missing file is not an
// error.
template <class V>
struct ContractPairs : KeyValue<V> {
    using KeyValue<V>::KeyValue;
    void Run()
    {
        if (::access(this->path.c_str(), F_OK) != 0) return;
        const std::string text = ReadFile(this->path);
        this->pairs.clear();
        ForEachLine(text, [this](std::string_view line) {
            const std::size_t at = line.find('=');
            if (at == std::string_view::npos || at == 0 || at + 1 == line.size()) return;
            this->pairs.emplace(FirstWord(line.substr(0, at)),
                                ToValue<V>(FirstWord(line.substr(at + 1))));
        });
    }
};

#if BENCH_HAS_INIH
template <class V>
struct InihPairs : KeyValue<V> {
    using KeyValue<V>::KeyValue;
    static int Take(void* pairs, const char* /*section*/, const char* key, const char* value)
    {
        static_cast<std::map<std::string, V>*>(pairs)->emplace(key, ToValue<V>(value));
        return 1;
    }
    void Run()
    {
        this->pairs.clear();
        Require(ini_parse(this->path.c_str(), Take, &this->pairs) == 0, "inih cannot read");
    }
};
#endif

#if BENCH_HAS_GLIB
// Its files need a group: one more line.
template <class V>
struct GlibPairs : KeyValue<V> {
    explicit GlibPairs(int count) : KeyValue<V>(count, "[all]\n") {}
    void Run()
    {
        this->pairs.clear();
        GKeyFile* file = g_key_file_new();
        const bool loaded =
            g_key_file_load_from_file(file, this->path.c_str(), G_KEY_FILE_NONE, nullptr) != 0;
        gchar** keys = g_key_file_get_keys(file, "all", nullptr, nullptr);
        for (gchar** key = keys; loaded && *key != nullptr; ++key) Take(file, *key);
        g_strfreev(keys);
        g_key_file_free(file);
        Require(loaded, "GLib cannot read");
    }
    void Take(GKeyFile* file, const gchar* key)
    {
        if constexpr (std::is_same_v<V, std::string>) {
            gchar* value = g_key_file_get_string(file, "all", key, nullptr);
            this->pairs.emplace(key, value);
            g_free(value);
        } else if constexpr (std::is_same_v<V, int>) {
            this->pairs.emplace(key, g_key_file_get_integer(file, "all", key, nullptr));
        } else {
            this->pairs.emplace(key, g_key_file_get_double(file, "all", key, nullptr));
        }
    }
};
#endif

#if BENCH_HAS_BOOST
template <class V>
struct BoostPairs : KeyValue<V> {
    using KeyValue<V>::KeyValue;
    void Run()
    {
        this->pairs.clear();
        boost::property_tree::ptree tree;
        boost::property_tree::read_ini(this->path, tree);
        for (const auto& [key, child] : tree) {
            this->pairs.emplace(key, child.template get_value<V>());
        }
    }
};
#endif

constexpr const char* ReadSortAppend = "read-sort-append";

template <class V>
void AddLines(const std::string& count, int lines)
{
    constexpr double OfSorting = 1.1;
    constexpr double AheadOfPeers = 1.5;
    constexpr int Many = 1000;
    const std::string item = "key=value, " + count + " lines, " + KeyValue<V>::Kind();
    Add<OurPairs<V>>(item, Ours, lines);
    Add<BarePairs<V>>(item, Bare, lines);
    Add<ContractPairs<V>>(item, Contract, lines);
    if (lines >= Many) Add<SortedPairs<V>>(item, ReadSortAppend, lines);
#if BENCH_HAS_INIH
    Add<InihPairs<V>>(item, "inih", lines);
#endif
#if BENCH_HAS_GLIB
    Add<GlibPairs<V>>(item, "GKeyFile", lines);
#endif
#if BENCH_HAS_BOOST
    Add<BoostPairs<V>>(item, "Boost ptree", lines);
#endif
    if (lines >= Many) Aim({ReadSortAppend}, OfSorting);
    Aim({"inih", "GKeyFile", "Boost ptree"}, lines >= Many ? 1 : 1 / AheadOfPeers);
}

void AddKinds(const std::string& count, int lines)
{
    AddLines<std::string>(count, lines);
    AddLines<int>(count, lines);
    AddLines<double>(count, lines);
}

}  // namespace

void AddKeyValue()
{
    AddKinds("10", 10);
    AddKinds("1,000", 1000);
    AddKinds("100,000", 100'000);
}

}  // namespace Bench
