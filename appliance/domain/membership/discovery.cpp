#include "appliance/domain/membership/discovery.h"

#include <arpa/inet.h>
#include <arpa/nameser.h>
#include <netdb.h>
#include <netinet/in.h>
#include <poll.h>
#include <resolv.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <memory>
#include <system_error>

#include "appliance/base/file.h"
#include "appliance/base/text.h"
#include "appliance/domain/membership/samba.h"

namespace appliance {

namespace {

using std::chrono::milliseconds;
using Clock = std::chrono::steady_clock;

constexpr std::size_t kMaxControllers = 16;
constexpr std::size_t kAnswerSize = 65535;
constexpr std::size_t kSrvHeader = 6;  // priority, weight, port

milliseconds Until(Clock::time_point end) {
    return std::max(milliseconds(0), std::chrono::duration_cast<milliseconds>(end - Clock::now()));
}

// The system's resolver, told to give up in time.
class Resolver {
public:
    explicit Resolver(Clock::time_point end) : end_(end) {
        good_ = res_ninit(&state_) == 0;
    }
    ~Resolver() {
        if (good_) {
            res_nclose(&state_);
        }
    }
    Resolver(const Resolver&) = delete;
    Resolver& operator=(const Resolver&) = delete;

    // The answer's bytes; empty when there is none.
    std::vector<unsigned char> Ask(const std::string& name, int type) {
        const milliseconds left = Until(end_);
        if (!good_ || left < milliseconds(200)) {
            return {};
        }
        SpendAtMost(left);
        std::vector<unsigned char> answer(kAnswerSize);
        const bool search = name.find('.') == std::string::npos;
        const int length =
            search ? res_nsearch(&state_, name.c_str(), ns_c_in, type, answer.data(), static_cast<int>(answer.size()))
                   : res_nquery(&state_, name.c_str(), ns_c_in, type, answer.data(), static_cast<int>(answer.size()));
        answer.resize(length > 0 ? std::min(static_cast<std::size_t>(length), answer.size()) : 0);
        return answer;
    }

    std::vector<std::string> SearchDomains() const {
        std::vector<std::string> domains;
        for (std::size_t i = 0; good_ && i < MAXDNSRCH && state_.dnsrch[i] != nullptr; ++i) {
            domains.emplace_back(state_.dnsrch[i]);
        }
        return domains;
    }

private:
    // The first round waits `retrans` seconds for each server; each further one doubles that and shares it out.
    void SpendAtMost(milliseconds left) {
        const int servers = std::max(1, state_.nscount);
        const int seconds = std::max(1, static_cast<int>(left.count() / 1000));
        state_.retrans = 1;
        state_.retry = servers + 2 <= seconds ? 2 : 1;
    }

    struct __res_state state_ = {};
    Clock::time_point end_;
    bool good_ = false;
};

struct SrvRecord {
    int priority;
    int weight;
    std::string target;
};

// Calls `visit` for each record of a type in the answer section.
template <typename Visit>
void ForEachRecord(const std::vector<unsigned char>& answer, int type, const Visit& visit) {
    ns_msg message;
    if (answer.empty() || ns_initparse(answer.data(), static_cast<int>(answer.size()), &message) != 0) {
        return;
    }
    for (int i = 0; i < ns_msg_count(message, ns_s_an); ++i) {
        ns_rr record;
        if (ns_parserr(&message, ns_s_an, i, &record) == 0 && ns_rr_type(record) == type) {
            visit(message, record);
        }
    }
}

std::vector<SrvRecord> ParseSrv(const std::vector<unsigned char>& answer) {
    std::vector<SrvRecord> records;
    ForEachRecord(answer, ns_t_srv, [&records](const ns_msg& message, const ns_rr& record) {
        if (ns_rr_rdlen(record) <= kSrvHeader) {
            return;
        }
        const unsigned char* data = ns_rr_rdata(record);
        std::array<char, NS_MAXDNAME> target{};
        if (dn_expand(ns_msg_base(message), ns_msg_end(message), data + kSrvHeader, target.data(),
                      static_cast<int>(target.size())) < 0) {
            return;
        }
        const std::string name(target.data());
        if (IsDnsName(name)) {
            records.push_back({data[0] << 8 | data[1], data[2] << 8 | data[3], name});
        }
    });
    std::stable_sort(records.begin(), records.end(), [](const SrvRecord& one, const SrvRecord& other) {
        return one.priority != other.priority ? one.priority < other.priority : one.weight > other.weight;
    });
    return records;
}

std::vector<std::string> AskForAddresses(Resolver& resolver, const std::string& host) {
    std::vector<std::string> addresses;
    const std::array<std::pair<int, int>, 2> kinds = {{{ns_t_a, AF_INET}, {ns_t_aaaa, AF_INET6}}};
    for (const auto& kind : kinds) {
        const int type = kind.first;
        const int family = kind.second;
        ForEachRecord(resolver.Ask(host, type), type, [&addresses, family](const ns_msg&, const ns_rr& record) {
            std::array<char, INET6_ADDRSTRLEN> text{};
            const std::size_t wanted = family == AF_INET ? sizeof(in_addr) : sizeof(in6_addr);
            if (ns_rr_rdlen(record) == wanted &&
                inet_ntop(family, ns_rr_rdata(record), text.data(), static_cast<socklen_t>(text.size())) != nullptr) {
                addresses.emplace_back(text.data());
            }
        });
    }
    return addresses;
}

// One TCP connection on its way.
struct Attempt {
    FileDescriptor socket;
    std::string reason = "timed out";
    bool pending = false;
};

Attempt StartConnecting(const addrinfo& place) {
    Attempt attempt;
    attempt.socket.Reset(socket(place.ai_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (attempt.socket && connect(attempt.socket.get(), place.ai_addr, place.ai_addrlen) == 0) {
        attempt.reason.clear();
    } else if (attempt.socket && errno == EINPROGRESS) {
        attempt.pending = true;
    } else {
        attempt.reason = std::generic_category().message(errno);
    }
    return attempt;
}

void FinishConnecting(Attempt& attempt) {
    int error = 0;
    socklen_t size = sizeof(error);
    getsockopt(attempt.socket.get(), SOL_SOCKET, SO_ERROR, &error, &size);
    attempt.reason = error == 0 ? "" : std::generic_category().message(error);
    attempt.pending = false;
}

// Waits until every attempt has ended or the time has.
void AwaitAll(std::vector<Attempt>& attempts, Clock::time_point end) {
    while (true) {
        std::vector<pollfd> waiting;
        for (const Attempt& attempt : attempts) {
            waiting.push_back({attempt.pending ? attempt.socket.get() : -1, POLLOUT, 0});
        }
        const bool any = std::any_of(attempts.begin(), attempts.end(), [](const Attempt& a) { return a.pending; });
        const milliseconds left = Until(end);
        if (!any || left == milliseconds(0)) {
            return;
        }
        if (poll(waiting.data(), waiting.size(), static_cast<int>(left.count())) < 0 && errno != EINTR) {
            return;
        }
        for (std::size_t i = 0; i < attempts.size(); ++i) {
            if (attempts[i].pending && waiting[i].revents != 0) {
                FinishConnecting(attempts[i]);
            }
        }
    }
}

// "10.0.0.4 EXAMPLE<1b>", one line for each answer.
std::vector<Controller> ParseNmblookup(const std::string& output) {
    std::vector<Controller> controllers;
    for (const std::string& line : Lines(output)) {
        const std::size_t blank = line.find(' ');
        const std::string address = line.substr(0, blank);
        if (blank != std::string::npos && IsAddress(address) && Contains(line, "<1b>")) {
            controllers.push_back({"", address});
        }
    }
    return controllers;
}

}  // namespace

std::vector<Controller> FindControllers(const std::string& dnsDomain, milliseconds deadline) {
    std::vector<Controller> controllers;
    if (!IsDnsName(dnsDomain)) {
        return controllers;
    }
    Resolver resolver(Clock::now() + deadline);
    for (const SrvRecord& record : ParseSrv(resolver.Ask("_ldap._tcp.dc._msdcs." + dnsDomain, ns_t_srv))) {
        for (const std::string& address : AskForAddresses(resolver, record.target)) {
            controllers.push_back({record.target, address});
            if (controllers.size() >= kMaxControllers) {
                return controllers;
            }
        }
    }
    return controllers;
}

std::vector<Controller> FindPrimaryController(const std::string& netbiosDomain, milliseconds deadline,
                                              const std::string& configuration) {
    if (!IsNetbiosName(netbiosDomain) || netbiosDomain[0] == '-') {
        return {};
    }
    const Clock::time_point end = Clock::now() + deadline;
    SambaCall call;
    call.configuration = configuration;
    call.arguments = {"--", Upper(netbiosDomain) + "#1B"};
    call.deadline = deadline;
    const CommandResult broadcast = RunNmblookup(call);
    if (broadcast.Succeeded()) {
        return ParseNmblookup(broadcast.output);
    }
    // A broadcast does not leave the network segment: a WINS server or lmhosts may know more.
    call.arguments = {"lookup", "pdc", Upper(netbiosDomain)};
    call.deadline = Until(end);
    const CommandResult lookup = RunNet(call);
    const std::string address = Trim(lookup.output);
    if (lookup.Succeeded() && IsAddress(address)) {
        return {{"", address}};
    }
    return {};
}

std::vector<std::string> AddressesOf(const std::string& host, milliseconds deadline) {
    if (IsAddress(host)) {
        return {host};
    }
    if (!IsDnsName(host)) {
        return {};
    }
    Resolver resolver(Clock::now() + deadline);
    return AskForAddresses(resolver, host);
}

std::vector<std::string> SearchDomains() {
    const Resolver resolver(Clock::now());
    std::vector<std::string> domains;
    for (const std::string& domain : resolver.SearchDomains()) {
        if (IsDnsName(domain)) {
            domains.push_back(domain);
        }
    }
    return domains;
}

bool IsAddress(const std::string& text) {
    in6_addr buffer{};
    return inet_pton(AF_INET, text.c_str(), &buffer) == 1 || inet_pton(AF_INET6, text.c_str(), &buffer) == 1;
}

std::vector<std::string> ProbePorts(const std::string& address, const std::vector<int>& ports, milliseconds deadline) {
    const Clock::time_point end = Clock::now() + deadline;
    std::vector<Attempt> attempts;
    for (const int port : ports) {
        addrinfo hints{};
        hints.ai_flags = AI_NUMERICHOST | AI_NUMERICSERV;
        hints.ai_socktype = SOCK_STREAM;
        addrinfo* place = nullptr;
        const int error = getaddrinfo(address.c_str(), std::to_string(port).c_str(), &hints, &place);
        const std::unique_ptr<addrinfo, void (*)(addrinfo*)> owner(place, freeaddrinfo);
        if (error != 0) {
            attempts.emplace_back();
            attempts.back().reason = gai_strerror(error);
        } else {
            attempts.push_back(StartConnecting(*place));
        }
    }
    AwaitAll(attempts, end);
    std::vector<std::string> reasons;
    reasons.reserve(attempts.size());
    for (const Attempt& attempt : attempts) {
        reasons.push_back(attempt.reason);
    }
    return reasons;
}

bool CanConnect(const std::string& address, int port, milliseconds deadline, std::string& reason) {
    reason = ProbePorts(address, {port}, deadline).front();
    return reason.empty();
}

}  // namespace appliance
