// Lines in and out, each failure of the system noticed.
#ifndef NODE_REGISTRY_LINE_IO_H
#define NODE_REGISTRY_LINE_IO_H

#include <cstdio>
#include <string>

namespace NodeRegistry {

// The lines of a file.
class LineReader {
  public:
    // Opens the file; "-" is standard input.
    explicit LineReader(const std::string& file);
    LineReader(const LineReader&) = delete;
    LineReader& operator=(const LineReader&) = delete;
    ~LineReader();

    // The next line, without its end. False when there is none: at the end of the file, or because
    // of GetErrno().
    bool Read(std::string& ret_line);

    // Why the file could not be opened or read; 0 when nothing failed.
    int GetErrno() const { return error; }

  private:
    std::FILE* stream;
    char* buffer = nullptr;
    std::size_t size = 0;
    int error = 0;
};

// Writes a text to standard output, at once: whoever listens on a pipe waits for it. Answers 0 or
// an errno code.
int WriteText(const std::string& text);

}  // namespace NodeRegistry

#endif
