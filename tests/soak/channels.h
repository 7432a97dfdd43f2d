// The two ways to the registry: HTTP, and the pipes of a program that may be killed and restarted.
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

// Makes a connection to 127.0.0.1 for each request.
class HttpChannel {
  public:
    HttpChannel(int servicePort, Findings& findings);

    Answer Ask(const std::string& request);
    std::optional<bool> AskNonsense(int which);

  private:
    int port_;
    Findings& findings_;
};

// One thread writes and reads lines, another passes in the pipes of each new process.
class LineChannel {
  public:
    LineChannel(std::string name, Findings& findings);
    LineChannel(const LineChannel&) = delete;
    LineChannel& operator=(const LineChannel&) = delete;
    ~LineChannel();

    // Passes in the pipes of a process that has just started. The channel closes them.
    void Give(Pipes fresh);

    // Ends the process by closing its input.
    void Close();

    Answer Ask(const std::string& request);
    std::optional<bool> AskNonsense(int which);

    // The next line from the process; none if it has ended.
    std::optional<std::string> ReadLine();

  private:
    bool TakeFresh();
    bool Write(const std::string& text) const;
    void CloseCurrent();

    std::string name_;
    Findings& findings_;
    Pipes current_;
    std::string unread_;

    std::mutex mutex_;  // guards `given`
    std::condition_variable changed_;
    std::optional<Pipes> given_;
};

}  // namespace Soak

#endif
