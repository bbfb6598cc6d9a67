// vornctl list

#include <memory>

#include "appliance/tools/vornctl/command.h"

namespace appliance::ctl {

namespace {

std::string Cell(const Json::Value& row, Json::ArrayIndex column) {
    return row.isArray() && column < row.size() && row[column].isString() ? row[column].asString() : "";
}

void PrintVersion1(Output& out, const Json::Value& list) {
    for (const Json::Value& name : list) {
        if (name.isString()) {
            out.Line(Escape(name.asString()));
        }
    }
}

// The first row of a list of organisational units is the workgroup itself.
void PrintVersion2(Output& out, const Json::Value& list) {
    std::vector<std::vector<std::string>> rows;
    if (Cell(list[0], 0) == "--") {
        for (Json::ArrayIndex i = 1; i < list.size(); ++i) {
            rows.push_back({Cell(list[i], 0), Cell(list[i], 1)});
        }
        out.Line("Trusted domains are not used. Organisational units of " + Escape(Cell(list[0], 2)) + ":");
        if (rows.empty()) {
            out.Line("none");
        } else {
            out.Table({"UNIT", "VALUE"}, rows);
        }
        return;
    }
    for (const Json::Value& row : list) {
        rows.push_back({Cell(row, 0), Cell(row, 2).empty() ? "-" : Cell(row, 2)});
    }
    out.Table({"DOMAIN", "DNS NAME"}, rows);
}

int RunList(Context& context, bool version1) {
    Answer answer;
    int exitCode = kDone;
    if (!CallAndReport(context, methods::DomainList(version1 ? 1 : 2), Json::Value(Json::objectValue), answer,
                       exitCode) ||
        context.json) {
        return exitCode;
    }
    const Json::Value& list = ListOf(answer.data, "domain_list");
    if (list.empty()) {
        context.err.Line("There are no domains: the appliance is not a member of one.");
    } else if (version1) {
        PrintVersion1(context.out, list);
    } else {
        PrintVersion2(context.out, list);
    }
    return kDone;
}

}  // namespace

Runner SetUpList(Arguments arguments) {
    const auto version1 = std::make_shared<bool>(false);
    arguments.Flag("--v1", *version1, "the names alone, one in a line (version 1 of the method)");
    arguments.Footer(
        "The own domain comes first. While trusted domains are not used, the\n"
        "organisational units of the own domain are listed instead; --v1 always lists\n"
        "domains.");
    return [version1](Context& context) { return RunList(context, *version1); };
}

}  // namespace appliance::ctl
