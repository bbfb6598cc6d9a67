// Services, capabilities, the last error, address tests, DNS servers and the event log.

#include <arpa/inet.h>

#include "platform/eventlog.h"
#include "platform/network.h"
#include "tests/double/containers.h"

using fake::Number;
using fake::Quoted;
using fake::Recording;
using fake::State;
using fake::TheAppliance;

namespace {

bool IsAddress(int family, const char* text) {
    in6_addr address{};
    return inet_pton(family, text, &address) == 1;
}

}  // namespace

int VLIBServiceReload(const char* service) {
    Recording call("VLIBServiceReload", {Quoted(service)});
    if (call.Null(service) || call.Fails()) {
        return call.Failure(-1);
    }
    TheAppliance().state.reloadedServices.emplace_back(service);
    return call.Answer(0);
}

int VLIBServiceRestart(const char* service) {
    Recording call("VLIBServiceRestart", {Quoted(service)});
    if (call.Null(service) || call.Fails()) {
        return call.Failure(-1);
    }
    TheAppliance().state.restartedServices.emplace_back(service);
    return call.Answer(0);
}

int VLIBServiceTypeReload(int type) {
    Recording call("VLIBServiceTypeReload", {Number(type)});
    if (call.Fails()) {
        return call.Failure(-1);
    }
    TheAppliance().state.reloadedServiceTypes.push_back(type);
    return call.Answer(0);
}

int VLIBServiceIsEnabled(const char* service) {
    Recording call("VLIBServiceIsEnabled", {Quoted(service)});
    if (call.Null(service) || call.Fails()) {
        return call.Failure(-1);
    }
    return TheAppliance().state.enabledServices.count(service) != 0 ? call.Answer(1) : call.Failure(0);
}

int VLIBCSupportGet(const char* capability) {
    Recording call("VLIBCSupportGet", {Quoted(capability)});
    if (call.Null(capability) || call.Fails()) {
        return call.Failure(0);
    }
    const auto& supports = TheAppliance().state.supports;
    const auto found = supports.find(capability);
    return found == supports.end() || found->second == 0 ? call.Failure(0) : call.Answer(found->second);
}

int VLIBCErrGet(void) {
    const Recording call("VLIBCErrGet", {});
    return TheAppliance().state.lastError.code;
}

const char* VLIBCErrorGetFile(void) {
    const Recording call("VLIBCErrorGetFile", {});
    return TheAppliance().state.lastError.file;
}

int VLIBCErrorGetLine(void) {
    const Recording call("VLIBCErrorGetLine", {});
    return TheAppliance().state.lastError.line;
}

void VLIBCErrSetEx(int code, const char* file, int line) {
    Recording call("VLIBCErrSetEx", {Number(code), Quoted(file), Number(line)});
    if (!call.Null(file)) {
        TheAppliance().state.lastError = {code, file, line};
    }
}

int BlVLIBIsIpAddr(const char* text) {
    Recording call("BlVLIBIsIpAddr", {Quoted(text)});
    return call.Answer(!call.Null(text) && IsAddress(AF_INET, text) ? 1 : 0);
}

int BlVLIBIsv6IpAddrValid(const char* text) {
    Recording call("BlVLIBIsv6IpAddrValid", {Quoted(text)});
    return call.Answer(!call.Null(text) && IsAddress(AF_INET6, text) ? 1 : 0);
}

int VORNNetDNSListGet(VLIBSZLIST** servers) {
    Recording call("VORNNetDNSListGet", {fake::Named(servers, "list")});
    if (!fake::LiveList(call, servers)) {
        return call.Failure(-1);
    }
    if (call.Fails()) {
        fake::ReplaceList(servers);
        return call.Failure(-1);
    }
    fake::Append(servers, TheAppliance().state.dnsServers);
    return call.Answer(0);
}

int VORNNetDNSListSet(VLIBSZLIST* servers) {
    Recording call("VORNNetDNSListSet", {fake::ListText(servers)});
    if (!call.Live(servers, fake::HandleKind::kList) || call.Fails()) {
        return call.Failure(-1);
    }
    TheAppliance().state.dnsServers = fake::EntriesOf(servers);
    return call.Answer(0);
}

int VORNLogSet1(int kind, int level, int event, const char* arg1, const char* arg2, const char* arg3,
                const char* arg4) {
    Recording call("VORNLogSet1", {Number(kind), Number(level), Number(event), Quoted(arg1), Quoted(arg2), Quoted(arg3),
                                   Quoted(arg4)});
    if (call.Null(arg1, arg2, arg3, arg4) || call.Fails()) {
        return call.Failure(-1);
    }
    TheAppliance().state.events.push_back({kind, level, event, {arg1, arg2, arg3, arg4}});
    return call.Answer(0);
}
