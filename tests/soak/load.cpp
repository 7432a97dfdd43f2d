#include "load.h"

namespace Soak {

bool Gate::Enter()
{
    std::unique_lock<std::mutex> lock(mutex_);
    const bool hasToWait = isClosed_;
    changed_.wait(lock, [this] { return !isClosed_; });
    ++inside_;
    return hasToWait;
}

void Gate::Leave()
{
    const std::lock_guard<std::mutex> lock(mutex_);
    --inside_;
    changed_.notify_all();
}

bool Gate::Close(milliseconds patience)
{
    std::unique_lock<std::mutex> lock(mutex_);
    isClosed_ = true;
    return changed_.wait_for(lock, patience, [this] { return inside_ == 0; });
}

void Gate::Open()
{
    const std::lock_guard<std::mutex> lock(mutex_);
    isClosed_ = false;
    changed_.notify_all();
}

Load::Load(const Plan& thePlan, const Company& company, Findings& where)
    : plan_(thePlan), findings_(where), http_(company.Port(), where)
{
    for (int number = 1; number <= Connections; ++number) {
        Add("http" + std::to_string(number), http_);
    }
    for (std::size_t index = 0; index < Registries; ++index) {
        Add("line" + std::to_string(index + 1), company.RegistryChannel(index));
    }
}

void Load::Start()
{
    for (const auto& client : clients_) {
        threads_.emplace_back([this, &client] { Run(*client); });
    }
}

void Load::Stop()
{
    isStopping_ = true;
    for (std::thread& thread : threads_) thread.join();
    threads_.clear();
}

void Load::Pause(const std::function<void()>& look)
{
    if (!gate_.Close(plan_.bounds.wait * 2))
        findings_.Add(Promise::Waits, "requests do not finish");
    look();
    gate_.Open();
}

std::vector<const Client*> Load::Clients() const
{
    std::vector<const Client*> all;
    for (const auto& client : clients_) all.push_back(client.get());
    return all;
}

std::vector<const Client*> Load::HttpClients() const
{
    std::vector<const Client*> first = Clients();
    first.resize(Connections);
    return first;
}

template <class Channel>
void Load::Add(const std::string& name, Channel& channel)
{
    clients_.push_back(std::make_unique<Client>(
        name, [&channel](const std::string& request) { return channel.Ask(request); },
        [&channel](int which) { return channel.AskNonsense(which); }, plan_.bounds, findings_));
}

void Load::Run(Client& client)
{
    while (!isStopping_) {
        if (gate_.Enter()) client.ForgetGap();
        client.AskOne();
        gate_.Leave();
    }
}

}  // namespace Soak
