// vornctl users, vornctl groups

#include <CLI/CLI.hpp>

#include "appliance/tools/vornctl/command.h"

namespace appliance::ctl {

namespace {

constexpr int kPage = 100;
constexpr int kLargestPage = 1000;

struct ListOptions {
    std::string domain;
    std::string search;
    int offset = 0;
    int limit = kPage;
};

std::string NumberText(const Json::Value& value) {
    return value.isInt64() ? std::to_string(value.asInt64()) : "-";
}

void PrintFooter(Output& err, const Json::Value& data, const ListOptions& options, const std::string& kind) {
    const Json::Int64 total = NumberOf(data, "total");
    const Json::Int64 first = NumberOf(data, "offset");
    const auto count = static_cast<Json::Int64>(ListOf(data, "entries").size());
    if (MemberOf(data, "fetched").isNull()) {
        err.Paragraph("", 0,
                      "There is no list of the " + kind + " of " + Escape(TextOf(data, "domain")) +
                          " yet; \"vornctl refresh\" fetches it.");
        return;
    }
    const std::string place = Escape(TextOf(data, "domain")) + ", fetched " + TimeText(MemberOf(data, "fetched"));
    const std::string matching = options.search.empty() ? "" : " that match";
    if (count == 0) {
        err.Line("None of " + std::to_string(total) + " " + kind + matching + " of " + place + ".");
        return;
    }
    err.Line(std::to_string(first + 1) + " to " + std::to_string(first + count) + " of " + std::to_string(total) + " " +
             kind + matching + " of " + place + ".");
    if (first + count < total) {
        err.Line("The next ones: --offset " + std::to_string(first + count));
    }
}

int RunListOf(Context& context, const Method& method, const ListOptions& options) {
    Json::Value request;
    request["offset"] = options.offset;
    request["limit"] = options.limit;
    if (!options.domain.empty()) {
        request["domain"] = options.domain;
    }
    if (!options.search.empty()) {
        request["search"] = options.search;
    }
    Answer answer;
    int exitCode = kDone;
    if (!CallAndReport(context, method, request, answer, exitCode) || context.json) {
        return exitCode;
    }
    std::vector<std::vector<std::string>> rows;
    for (const Json::Value& entry : ListOf(answer.data, "entries")) {
        rows.push_back({TextOf(entry, "name"), NumberText(MemberOf(entry, "id")), TextOf(entry, "display")});
    }
    if (!rows.empty()) {
        context.out.Table({"NAME", ">ID", "DISPLAY NAME"}, rows);
    }
    PrintFooter(context.err, answer.data, options, method.name);
    return kDone;
}

Runner SetUpListOf(CLI::App& parser, Method (*method)()) {
    const auto options = std::make_shared<ListOptions>();
    parser.add_option("--domain", options->domain, "NetBIOS name of the domain; without it, the own one")
        ->type_name("NAME");
    parser.add_option("--search", options->search, "only those whose name or display name holds this text")
        ->type_name("TEXT");
    parser.add_option("--offset", options->offset, "pass over so many")
        ->type_name("N")
        ->check(CLI::Range(0, 2147483647).description(""));
    parser.add_option("--limit", options->limit, "show so many at most, 1 to 1000; 100 without it")
        ->type_name("N")
        ->check(CLI::Range(1, kLargestPage).description(""));
    parser.footer("Reads the list that the last refresh made; no controller is asked.");
    return [options, method](Context& context) { return RunListOf(context, method(), *options); };
}

}  // namespace

Runner SetUpUsers(CLI::App& parser) {
    return SetUpListOf(parser, methods::Users);
}

Runner SetUpGroups(CLI::App& parser) {
    return SetUpListOf(parser, methods::Groups);
}

}  // namespace appliance::ctl
