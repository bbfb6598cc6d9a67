// The same files read by the file-sharing service's own tool: both must see the same keys.

#include <gtest/gtest.h>

#include <algorithm>
#include <map>
#include <random>
#include <regex>

#include "appliance/base/command.h"
#include "appliance/base/conf_file.h"
#include "appliance/base/text.h"
#include "tests/appliance/base/temporary_folder.h"

using appliance::ConfFile;

namespace {

using Values = std::map<std::string, std::string>;

class ConfFileSambaTest : public appliance_test::FolderTest {
protected:
    // The keys "vorn:..." of the global section, as testparm shows them.
    Values Shown(const std::string& text) {
        Put(folder / "smb.conf", text);
        appliance::Command command;
        command.arguments = {"/usr/bin/testparm", "-s", folder / "smb.conf"};
        const appliance::CommandResult result = appliance::Run(command);
        EXPECT_TRUE(result.Succeeded()) << result.Describe() << result.errors << text;
        Values values;
        std::string section;
        for (const std::string& line : appliance::Lines(result.output)) {
            if (appliance::StartsWith(line, "[")) {
                section = line;
                continue;
            }
            const std::size_t sign = line.find(" = ");
            if (section == "[global]" && appliance::StartsWith(appliance::KeyIdentity(line.substr(0, sign)), "vorn:")) {
                values[appliance::KeyIdentity(line.substr(0, sign))] = Folded(line.substr(sign + 3));
            }
        }
        return values;
    }

    static Values Own(const std::string& text) {
        Values values;
        for (const auto& [key, value] : ConfFile(text).Section("global")) {
            if (appliance::StartsWith(appliance::KeyIdentity(key), "vorn:")) {
                values[appliance::KeyIdentity(key)] = Folded(value);
            }
        }
        return values;
    }

    // Several blanks are shown as one.
    static std::string Folded(const std::string& value) {
        return std::regex_replace(value, std::regex("[ \t\r\v\f]+"), " ");
    }
};

TEST_F(ConfFileSambaTest, GeneratedFiles) {
    const std::vector<std::string> pieces = {
        "vorn:a = 1\n",
        "vorn:a=2\n",
        "VORN:A=3\n",
        "  vorn : a =  4 \t\r\n",
        "vorn:b = x \\\n   y\n",
        "vorn:b = x\\\ny\\\n\n",
        "vorn:c \\\n = 1\n",
        "vo\\\nrn:c = 2\n",
        "vorn:d = a\\  \nb\n",
        "vorn:d = \\\nvorn:e = 1\n",
        "vorn:e = a \\\\\nb\n",
        "vorn:e = \"q  q\" # no ; comment\n",
        "vorn:f =\n",
        "# vorn:f = 1 \\\n",
        ";vorn:f=2\n",
        "nonsense\n",
        "nonsense \\\n vorn:f = 2\n",
        "[global]\n",
        "[GLO BAL] vorn:g=1\n",
        "[glo\\\nbal]\n",
        "[global] x \\\nvorn:g = 2\n",
        "[other]\n",
        "vorn:g = [x]\n",
        "vorn:h = DOM\\user\n",
        "vorn:h = a=b\n",
        "\n",
        " \\\n",
        "\v\f\n",
        "vorn:i = \xC3\xA4\n",
    };
    const std::vector<std::string> ends = {"", "vorn:z = 1", "vorn:z = 1\\", "vorn:z = 1\\\n", "# c \\"};
    std::mt19937 random(7);
    for (int turn = 0; turn < 60; ++turn) {
        std::string text;
        const auto count = random() % 14;
        for (unsigned i = 0; i < count; ++i) {
            text += pieces[random() % pieces.size()];
        }
        text += ends[random() % ends.size()];
        EXPECT_EQ(Own(text), Shown(text)) << text;
        // And when one key was set, and another section written.
        ConfFile file(text);
        if (file.Set("global", "vorn:new", "n") && file.SetSection("new", {{"vorn:a", "9"}}, "    %s=%s\n")) {
            Values expected = Own(text);
            expected["vorn:new"] = "n";
            EXPECT_EQ(Shown(file.text()), expected) << file.text();
        }
    }
}

TEST_F(ConfFileSambaTest, AWrittenSectionIsRead) {
    ConfFile file;
    ASSERT_TRUE(file.SetSection("global", {{"vorn:a", "1"}, {"server signing", "yes"}, {"winbind expand groups", "7"}},
                                "    %s=%s\n"));
    Put(folder / "smbinfo.conf", file.text());
    Put(folder / "smb.conf", "[global]\n    include = " + folder / "smbinfo.conf" + "\n");
    appliance::Command command;
    command.arguments = {"/usr/bin/testparm", "-s", "--parameter-name=winbind expand groups", folder / "smb.conf"};
    EXPECT_EQ(appliance::Run(command).output, "7\n");
    command.arguments[2] = "--parameter-name=server signing";
    EXPECT_EQ(appliance::Run(command).output, "if_required\n");
}

}  // namespace
