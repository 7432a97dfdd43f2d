// All clients of a soak, each with its own thread.
#ifndef ORVADRCORE_TESTS_SOAK_LOAD_H
#define ORVADRCORE_TESTS_SOAK_LOAD_H

#include <atomic>
#include <condition_variable>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "channels.h"
#include "client.h"
#include "company.h"
#include "findings.h"
#include "plan.h"

namespace Soak {

// Stops clients from starting requests.
class Gate {
  public:
    // Call these around a request. Enter() waits while the gate is closed, and returns whether it
    // did.
    bool Enter();
    void Leave();

    // Returns when no request is in progress; false if that takes too long.
    bool Close(milliseconds patience);
    void Open();

  private:
    std::mutex mutex_;
    std::condition_variable changed_;
    bool isClosed_ = false;
    int inside_ = 0;
};

class Load {
  public:
    Load(const Plan& plan, const Company& company, Findings& findings);
    Load(const Load&) = delete;
    Load& operator=(const Load&) = delete;
    ~Load() { Stop(); }

    void Start();

    // Returns when all clients have got their last answer.
    void Stop();

    // Calls `look` while no request is in progress.
    void Pause(const std::function<void()>& look);

    // For use after Stop(). The HTTP clients come first.
    std::vector<const Client*> Clients() const;
    std::vector<const Client*> HttpClients() const;

  private:
    template <class Channel>
    void Add(const std::string& name, Channel& channel);
    void Run(Client& client);

    const Plan& plan_;
    Findings& findings_;
    HttpChannel http_;
    std::vector<std::unique_ptr<Client>> clients_;
    std::vector<std::thread> threads_;
    Gate gate_;
    std::atomic<bool> isStopping_{false};
};

}  // namespace Soak

#endif
