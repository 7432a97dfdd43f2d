#include "channels.h"

#include <poll.h>
#include <unistd.h>

#include <array>
#include <utility>

#include <orvadrcore/response.h>

#include "base/errno.h"
#include "examples/node_registry/json_line.h"
#include "support/processes/http_client.h"

namespace Soak {

using OrvaDRCore::Response;
using OrvaDRCore::RetryOnEintr;

namespace {

// Far longer than any answer takes: after it none is coming.
constexpr seconds Patience{60};

constexpr milliseconds AwaitFresh{100};
constexpr int BadParameter = 401;

Answer ToldBy(const std::string& text)
{
    Answer answer;
    answer.outcome = Answer::Outcome::Told;
    if (!NodeRegistry::ParseLine(text, answer.reply)) answer.reply = text;
    return answer;
}

Answer Lost()
{
    return {Answer::Outcome::Lost, {}};
}

void ReportNoAnswer(Findings& findings, const std::string& who)
{
    findings.Add(Promise::Waits,
                 who + ": no answer within " + std::to_string(Patience.count()) + " s");
}

// An invalid request and the HTTP status that it must get.
struct Invalid {
    std::string bytes;
    int status;
};

Invalid InvalidOf(int which)
{
    constexpr std::size_t TooLarge = 1'100'000;
    switch (which % 4) {
        case 0: return {HttpRequest("POST", "/webapi", "{\"api\":"), 200};
        case 1: return {HttpRequest("POST", "/nowhere", "{}"), 404};
        case 2: return {HttpRequest("GET", "/webapi", ""), 405};
        default: return {HttpRequest("POST", "/webapi", std::string(TooLarge, ' ')), 413};
    }
}

}  // namespace

HttpChannel::HttpChannel(int servicePort, Findings& where) : port_(servicePort), findings_(where) {}

Answer HttpChannel::Ask(const std::string& request)
{
    const auto begin = Clock::now();
    const HttpConnection connection(port_, Patience);
    if (!connection.IsOpen()) return {};
    connection.Send(HttpRequest("POST", "/webapi", request));
    const HttpReply reply = connection.Receive();
    if (reply.status == 200) return ToldBy(reply.body);
    if (Clock::now() - begin >= Patience) ReportNoAnswer(findings_, request);
    if (reply.status != 0) {
        findings_.Add(Promise::Answers, request + " got HTTP " + std::to_string(reply.status));
    }
    return Lost();
}

std::optional<bool> HttpChannel::AskNonsense(int which)
{
    const HttpConnection connection(port_, Patience);
    if (!connection.IsOpen()) return std::nullopt;
    const Invalid invalid = InvalidOf(which);
    connection.Send(invalid.bytes);
    const HttpReply reply = connection.Receive();
    if (reply.status == 0) return std::nullopt;
    return reply.status == invalid.status && !Response(reply.body).isSuccess();
}

LineChannel::LineChannel(std::string who, Findings& where) : name_(std::move(who)), findings_(where)
{
}

LineChannel::~LineChannel()
{
    CloseCurrent();
}

void LineChannel::Give(Pipes fresh)
{
    const std::lock_guard<std::mutex> lock(mutex_);
    given_ = fresh;
    changed_.notify_all();
}

void LineChannel::Close()
{
    if (current_.in < 0) TakeFresh();
    if (current_.in >= 0) ::close(current_.in);
    current_.in = -1;
}

Answer LineChannel::Ask(const std::string& request)
{
    if (current_.in < 0 && !TakeFresh()) return {};
    if (!Write(request + "\n")) {
        CloseCurrent();
        return Lost();
    }
    const std::optional<std::string> line = ReadLine();
    return line ? ToldBy(*line) : Lost();
}

std::optional<bool> LineChannel::AskNonsense(int /*which*/)
{
    const Answer answer = Ask("{\"api\":");
    if (answer.outcome != Answer::Outcome::Told) return std::nullopt;
    return Response(answer.reply).getErrCode() == BadParameter;
}

std::optional<std::string> LineChannel::ReadLine()
{
    if (current_.out < 0 && !TakeFresh()) return std::nullopt;
    std::size_t end = unread_.find('\n');
    while (end == std::string::npos) {
        pollfd waiting{current_.out, POLLIN, 0};
        if (::poll(&waiting, 1, static_cast<int>(milliseconds(Patience).count())) == 0) {
            ReportNoAnswer(findings_, name_);
        }
        std::array<char, 16384> buffer{};
        const ssize_t count =
            waiting.revents == 0 ? 0 : ::read(current_.out, buffer.data(), buffer.size());
        if (count <= 0) {
            CloseCurrent();
            return std::nullopt;
        }
        unread_.append(buffer.data(), static_cast<std::size_t>(count));
        end = unread_.find('\n');
    }
    std::string line = unread_.substr(0, end);
    unread_.erase(0, end + 1);
    return line;
}

// Takes the pipes of the next process, if one starts soon.
bool LineChannel::TakeFresh()
{
    std::unique_lock<std::mutex> lock(mutex_);
    if (!changed_.wait_for(lock, AwaitFresh, [this] { return given_.has_value(); })) return false;
    current_ = *given_;
    given_.reset();
    return true;
}

bool LineChannel::Write(const std::string& text) const
{
    std::size_t written = 0;
    while (written < text.size()) {
        const ssize_t count = RetryOnEintr(
            [&] { return ::write(current_.in, text.data() + written, text.size() - written); });
        if (count <= 0) return false;
        written += static_cast<std::size_t>(count);
    }
    return true;
}

void LineChannel::CloseCurrent()
{
    if (current_.in >= 0) ::close(current_.in);
    if (current_.out >= 0) ::close(current_.out);
    current_ = {};
    unread_.clear();
}

}  // namespace Soak
