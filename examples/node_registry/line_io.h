// Reading lines and writing text, with every system error reported.
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

    // The next line, without its newline. False at the end of the file and on an error: see
    // GetErrno().
    bool Read(std::string& ret_line);

    // The errno of a failed open or read; otherwise 0.
    int GetErrno() const { return error_; }

  private:
    std::FILE* stream_;
    char* buffer_ = nullptr;
    std::size_t size_ = 0;
    int error_ = 0;
};

// Writes to standard output and flushes, because a reader at the other end of a pipe may be waiting.
// Returns 0 or an errno value.
int WriteText(const std::string& text);

}  // namespace NodeRegistry

#endif
