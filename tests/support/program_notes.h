// The programs that the tested code starts, with their arguments. A program is started by a process
// of its own, so the notes are in memory that it shares with the test.
#ifndef ORVADRCORE_TESTS_PROGRAM_NOTES_H
#define ORVADRCORE_TESTS_PROGRAM_NOTES_H

#include <sys/mman.h>

#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

class ProgramNotes {
  public:
    ProgramNotes()
        : page(static_cast<Page*>(::mmap(nullptr, sizeof(Page), PROT_READ | PROT_WRITE,
                                         MAP_SHARED | MAP_ANONYMOUS, -1, 0)))
    {
        if (page == MAP_FAILED) std::abort();
    }
    ProgramNotes(const ProgramNotes&) = delete;
    ProgramNotes& operator=(const ProgramNotes&) = delete;
    ~ProgramNotes() { ::munmap(page, sizeof(Page)); }

    // In the process that is to become the program: arguments, the last one null.
    void Note(char* const* arguments)
    {
        for (; *arguments != nullptr; ++arguments) Append(*arguments);
        Append("");
    }

    // The arguments of each program so far, the program itself being the first.
    std::vector<std::vector<std::string>> Taken() const
    {
        std::vector<std::vector<std::string>> programs;
        std::vector<std::string> arguments;
        for (std::size_t at = 0; at < page->used;) {
            const std::string argument = page->text + at;
            at += argument.size() + 1;
            if (!argument.empty()) {
                arguments.push_back(argument);
            } else {
                programs.push_back(arguments);
                arguments.clear();
            }
        }
        return programs;
    }

  private:
    struct Page {
        std::size_t used;
        char text[64 * 1024];
    };

    void Append(const char* argument)
    {
        const std::size_t size = std::strlen(argument) + 1;
        if (page->used + size > sizeof page->text) std::abort();
        std::memcpy(page->text + page->used, argument, size);
        page->used += size;
    }

    Page* page;
};

#endif
