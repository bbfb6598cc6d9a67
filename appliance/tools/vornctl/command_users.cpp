// vornctl users, vornctl groups

#include <memory>

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

Runner SetUpListOf(Arguments arguments, Method (*method)()) {
    const auto options = std::make_shared<ListOptions>();
    arguments.Text("--domain", options->domain, "NetBIOS name of the domain; without it, the own one").TypeName("NAME");
    arguments.Text("--search", options->search, "only those whose name or display name holds this text")
        .TypeName("TEXT");
    arguments.Number("--offset", options->offset, "pass over so many").TypeName("N").Between(0, 2147483647);
    arguments.Number("--limit", options->limit, "show so many at most, 1 to 1000; 100 without it")
        .TypeName("N")
        .Between(1, kLargestPage);
    arguments.Footer("Reads the list that the last refresh made; no controller is asked.");
    return [options, method](Context& context) { return RunListOf(context, method(), *options); };
}

}  // namespace

Runner SetUpUsers(Arguments arguments) {
    return SetUpListOf(arguments, methods::Users);
}

Runner SetUpGroups(Arguments arguments) {
    return SetUpListOf(arguments, methods::Groups);
}

}  // namespace appliance::ctl
