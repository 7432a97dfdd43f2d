#include "load.h"

namespace Soak {

bool Gate::Enter()
{
    std::unique_lock<std::mutex> lock(mutex);
    const bool hasToWait = isClosed;
    changed.wait(lock, [this] { return !isClosed; });
    ++inside;
    return hasToWait;
}

void Gate::Leave()
{
    const std::lock_guard<std::mutex> lock(mutex);
    --inside;
    changed.notify_all();
}

bool Gate::Close(milliseconds patience)
{
    std::unique_lock<std::mutex> lock(mutex);
    isClosed = true;
    return changed.wait_for(lock, patience, [this] { return inside == 0; });
}

void Gate::Open()
{
    const std::lock_guard<std::mutex> lock(mutex);
    isClosed = false;
    changed.notify_all();
}

Load::Load(const Plan& thePlan, const Company& company, Findings& where)
    : plan(thePlan), findings(where), http(company.Port(), where)
{
    for (int number = 1; number <= Connections; ++number) {
        Add("http" + std::to_string(number), http);
    }
    for (std::size_t index = 0; index < Registries; ++index) {
        Add("line" + std::to_string(index + 1), company.RegistryChannel(index));
    }
}

void Load::Start()
{
    for (const auto& client : clients) {
        threads.emplace_back([this, &client] { Run(*client); });
    }
}

void Load::Stop()
{
    isStopping = true;
    for (std::thread& thread : threads) thread.join();
    threads.clear();
}

void Load::Pause(const std::function<void()>& look)
{
    if (!gate.Close(plan.bounds.wait * 2)) findings.Add(Promise::Waits, "requests do not finish");
    look();
    gate.Open();
}

std::vector<const Client*> Load::Clients() const
{
    std::vector<const Client*> all;
    for (const auto& client : clients) all.push_back(client.get());
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
    clients.push_back(std::make_unique<Client>(
        name, [&channel](const std::string& request) { return channel.Ask(request); },
        [&channel](int which) { return channel.AskNonsense(which); }, plan.bounds, findings));
}

void Load::Run(Client& client)
{
    while (!isStopping) {
        if (gate.Enter()) client.ForgetGap();
        client.AskOne();
        gate.Leave();
    }
}

}  // namespace Soak
