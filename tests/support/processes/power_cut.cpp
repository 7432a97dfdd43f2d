#include "support/processes/power_cut.h"

#include <algorithm>
#include <optional>
#include <utility>

namespace {

constexpr std::size_t BlockSize = 4096;

// What the disk can hold of a file that was changed since its last sync.
std::set<StoredFile> Remains(const StoredFile& synced, const StoredFile& now)
{
    if (synced == now) return {now};
    std::set<std::string> texts{synced.text, now.text};
    const std::size_t size = now.text.size();
    for (std::size_t block = 0; block < size; block += BlockSize) {
        const std::size_t length = std::min(BlockSize, size - block);
        const std::string begin = now.text.substr(0, block);
        texts.insert(begin);
        texts.insert(now.text.substr(0, block + length / 2));
        texts.insert(begin + std::string(size - block, '\0'));
        texts.insert(begin + std::string(length, '\0') + now.text.substr(block + length));
        if (block < synced.text.size()) texts.insert(begin + synced.text.substr(block));
    }
    std::set<StoredFile> remains;
    for (const std::string& text : texts) {
        remains.insert({text, synced.mode});
        remains.insert({text, now.mode});
    }
    return remains;
}

// What is synced to a disk, and what processes see.
class Disk {
  public:
    explicit Disk(const Directory& before)
    {
        for (const auto& [name, file] : before) {
            names_[name] = static_cast<int>(files_.size());
            files_.push_back({file, file});
        }
    }

    void Do(const Change& change);
    std::set<Directory> AfterCut() const;

  private:
    struct File {
        StoredFile synced;
        StoredFile now;
    };
    struct NewName {
        std::string name;
        std::optional<int> file;  // none for a removed name
    };
    using Names = std::map<std::string, int>;

    Names NamesAfterCut(std::size_t reached) const;
    void AddStates(const Names& found, std::set<Directory>& states) const;

    std::vector<File> files_;
    Names names_;                    // synced
    std::vector<NewName> unsynced_;  // in the order of the changes
};

void Disk::Do(const Change& change)
{
    if (change.kind == Kind::Make) files_.push_back({{{}, change.mode}, {{}, change.mode}});
    File* const file =
        change.file < 0 ? nullptr : &files_.at(static_cast<std::size_t>(change.file));
    switch (change.kind) {
        case Kind::Make: unsynced_.push_back({change.name, change.file}); break;
        case Kind::Resize: file->now.text.resize(change.at, '\0'); break;
        case Kind::Write: {
            std::string& text = file->now.text;
            if (text.size() < change.at) text.resize(change.at, '\0');
            text.replace(change.at, change.text.size(), change.text);
            break;
        }
        case Kind::SetMode: file->now.mode = change.mode; break;
        case Kind::Sync: file->synced = file->now; break;
        case Kind::Rename:
            unsynced_.push_back({change.newName, change.file});
            unsynced_.push_back({change.name, std::nullopt});
            break;
        case Kind::Remove: unsynced_.push_back({change.name, std::nullopt}); break;
        case Kind::SyncDirectory:
            names_ = NamesAfterCut(~std::size_t{0});
            unsynced_.clear();
            break;
    }
}

// The names on the disk, when those unsynced changes have reached it whose bits are set.
Disk::Names Disk::NamesAfterCut(std::size_t reached) const
{
    Names found = names_;
    for (const NewName& change : unsynced_) {
        const bool hasReached = (reached & 1U) != 0;
        reached >>= 1U;
        if (!hasReached) continue;
        if (change.file) {
            found[change.name] = *change.file;
        } else {
            found.erase(change.name);
        }
    }
    return found;
}

// Adds all combinations of what the disk can hold of the files with these names.
void Disk::AddStates(const Names& found, std::set<Directory>& states) const
{
    std::set<Directory> all{{}};
    for (const auto& [name, number] : found) {
        const File& file = files_.at(static_cast<std::size_t>(number));
        std::set<Directory> more;
        for (const StoredFile& remain : Remains(file.synced, file.now)) {
            for (Directory directory : all) {
                directory[name] = remain;
                more.insert(std::move(directory));
            }
        }
        all = std::move(more);
    }
    states.merge(all);
}

std::set<Directory> Disk::AfterCut() const
{
    std::set<Directory> states;
    const std::size_t ways = std::size_t{1} << unsynced_.size();
    for (std::size_t reached = 0; reached < ways; ++reached) {
        AddStates(NamesAfterCut(reached), states);
    }
    return states;
}

}  // namespace

std::set<Directory> StatesAfterCut(const Directory& before, const Record& record)
{
    Disk disk(before);
    for (const Change& change : record) disk.Do(change);
    return disk.AfterCut();
}

std::set<Directory> StatesAfterAnyCut(const Directory& before, const Record& record)
{
    Disk disk(before);
    std::set<Directory> states = disk.AfterCut();
    for (const Change& change : record) {
        disk.Do(change);
        states.merge(disk.AfterCut());
    }
    return states;
}
