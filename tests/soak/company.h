// The processes of a soak: the service, two command-line registries and a neighbour. A killed one
// is started again.
#ifndef ORVADRCORE_TESTS_SOAK_COMPANY_H
#define ORVADRCORE_TESTS_SOAK_COMPANY_H

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "channels.h"
#include "findings.h"
#include "plan.h"
#include "process.h"

namespace Soak {

// A program that is kept running.
class Member {
  public:
    struct Program {
        std::vector<std::string> words;
        std::string logFile;
        std::function<bool(Pipes)>
            welcome;  // takes the pipes; false if the program did not come up
        std::function<void(pid_t)> tellToEnd;
    };

    Member(std::string name, Program program, const Bounds& bounds, Reaper& reaper,
           Findings& findings);

    // Starts it, and repeats that for as long as the bounds allow.
    void Start();

    void Kill();

    // Starts it again after it was killed. It must not end in another way.
    void Tend();

    // Ends it. It must do so in time and with exit code 0.
    void End() const;

    const std::string& Name() const { return name_; }
    pid_t Pid() const { return pid_; }
    int Kills() const { return kills_; }
    milliseconds LongestStart() const { return longestStart_; }

  private:
    std::string name_;
    Program program_;
    const Bounds& bounds_;
    Reaper& reaper_;
    Findings& findings_;
    pid_t pid_ = -1;
    bool isKilled_ = false;
    int kills_ = 0;
    milliseconds longestStart_{0};
};

// All members and the channels to them. For one thread, except that each channel has a client of
// its own.
class Company {
  public:
    Company(const Plan& plan, Reaper& reaper, Findings& findings);

    void Start();
    void Tend();
    void End();

    // The service first, then the registries, the neighbour last.
    const std::vector<std::unique_ptr<Member>>& Members() const { return members_; }
    Member& Service() const { return *members_.front(); }
    Member& Registry(std::size_t index) const { return *members_.at(1 + index); }
    Member& Neighbour() const { return *members_.back(); }

    int Port() const { return port_; }
    LineChannel& RegistryChannel(std::size_t index) const { return *channels_.at(index); }
    LineChannel& NeighbourChannel() const { return *channels_.back(); }

  private:
    void AddLineProgram(const Plan& plan, const std::string& name, std::vector<std::string> words);

    Reaper& reaper_;
    Findings& findings_;
    int port_;
    std::vector<std::unique_ptr<LineChannel>> channels_;
    std::vector<std::unique_ptr<Member>> members_;
};

}  // namespace Soak

#endif
