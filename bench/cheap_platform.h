// A stand-in for the appliance that costs next to nothing, so that a benchmark shows the module and not its platform.
// It answers from data that is made ahead of the measurement, changes nothing and keeps nothing of what it is told.
// What it can't make cheap, because a result is handed over by value, is measured by itself; see platform_calls.h.

#ifndef VORN_BENCH_CHEAP_PLATFORM_H
#define VORN_BENCH_CHEAP_PLATFORM_H

#include <json/value.h>

#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/webapi.h"

namespace cheap {

// How many of each the appliance has.
struct Sizes {
    int dnsServers = 2;
    int domains = 3;
    int units = 3;      // organisational units
    int tasks = 2;      // background tasks of the module, all ended
    int scheduled = 4;  // tasks of the scheduler; the last one is the module's
    int keys = 20;      // in section "global" of smbinfo.conf
    int nics = 2;       // under "register nic", in that section and in a request
};

struct Answers {
    bool member = true;
    bool trusts = true;
    int joinResult = 0;
};

// The file-sharing service tells keys apart without regard to case.
struct KeyHash {
    std::size_t operator()(std::string_view key) const;
};
struct KeyEqual {
    bool operator()(std::string_view left, std::string_view right) const;
};

struct State {
    Sizes sizes;
    Answers answers;
    std::vector<std::string> texts;  // owns what the lists below point to
    std::vector<const char*> dnsServers;
    std::vector<const char*> domains;
    std::vector<const char*> units;
    std::vector<const char*> unitValues;
    std::vector<std::string> dnsTexts;  // the DNS servers once more, for the joining of texts
    std::unordered_map<std::string_view, const char*, KeyHash, KeyEqual> section;
    Json::Value tasks;       // as the task framework lists them
    Json::Value taskStatus;  // of any task
    Json::Value schedule;    // of the module's scheduled task
    int lastCode = 0;        // of the last answer: 0 for success
};

State& TheState();

// Makes the data anew.
void Configure(const Sizes& sizes, const Answers& answers);

// The names of the register nics, as a client sends them.
Json::Value NicNames(int count);

// Addresses, separated by commas, as a client sends them. None of them is the appliance's.
std::string DnsText(int count);

void SetParams(VORN::APIRequest& request, const Json::Value& params);

// The names of the platform's operations in the order of the calls; only in a build with VORN_BENCH_TRACE, so that the
// measured builds bear no cost of it.
std::vector<const char*>& Trace();

#ifdef VORN_BENCH_TRACE
#define NOTE_CALL(name) ::cheap::Trace().push_back(name)
#else
#define NOTE_CALL(name) static_cast<void>(0)
#endif

// Fills a buffer of the caller with a text that is known to fit.
inline void Fill(char* buffer, std::string_view text) {
    text.copy(buffer, text.size());
    buffer[text.size()] = '\0';
}

}  // namespace cheap

#endif
