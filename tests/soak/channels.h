// The two ways to the registry: HTTP, and the lines of a program that may be killed and replaced.
#ifndef ORVADRCORE_TESTS_SOAK_CHANNELS_H
#define ORVADRCORE_TESTS_SOAK_CHANNELS_H

#include <condition_variable>
#include <mutex>
#include <optional>
#include <string>

#include "client.h"
#include "findings.h"
#include "process.h"

namespace Soak {

// A connection to 127.0.0.1 for each request.
class HttpChannel {
  public:
    HttpChannel(int servicePort, Findings& findings);

    Answer Ask(const std::string& request);
    std::optional<bool> AskNonsense(int which);

  private:
    int port;
    Findings& findings;
};

// One thread reads and writes the lines, another one hands over the pipes of each new process.
class LineChannel {
  public:
    LineChannel(std::string name, Findings& findings);
    LineChannel(const LineChannel&) = delete;
    LineChannel& operator=(const LineChannel&) = delete;
    ~LineChannel();

    // The pipes of a process that has just been started; from now on they are the channel's.
    void Give(Pipes fresh);

    // Closes the process's input, which ends it.
    void Close();

    Answer Ask(const std::string& request);
    std::optional<bool> AskNonsense(int which);

    // The next line of a process, or none when it has gone.
    std::optional<std::string> ReadLine();

  private:
    bool TakeFresh();
    bool Write(const std::string& text) const;
    void CloseCurrent();

    std::string name;
    Findings& findings;
    Pipes current;
    std::string unread;

    std::mutex mutex;  // guards `given`
    std::condition_variable changed;
    std::optional<Pipes> given;
};

}  // namespace Soak

#endif
