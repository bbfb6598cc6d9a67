// Generated files and words through the contract's operations.

#include <random>
#include <string>
#include <vector>

#include "tests/appliance/core/conf_rules.h"
#include "tests/appliance/core/core_test.h"

namespace {

using Random = std::mt19937;

class ConfRandomTest : public appliance_test::CoreTest {
protected:
    static std::string Pick(Random& random, const std::vector<std::string>& from) {
        return from[random() % from.size()];
    }
    static std::string Text(Random& random) {
        static const std::vector<std::string> pieces = {
            "a",         "A",        "work group",
            "WorkGroup", "=",        "=",
            " = ",       "[global]", "[ x ]",
            "[X]",       "[",        "]",
            "#",         ";",        "\n",
            "\n",        "\n",       "\r\n",
            "\\\n",      " \\ \n",   "\\",
            " ",         "\t",       "1",
            "yes",       "\v",       "\xC3\xA4",
            "\xFF",      "\x7F",     std::string(1, '\0'),
            "a=1\n",     "b=2\n",    "a = old \\\n more\n",
        };
        std::string text;
        for (auto count = random() % 16; count > 0; --count) {
            text += Pick(random, pieces);
        }
        return text;
    }
};

TEST_F(ConfRandomTest, EveryRuleHolds) {
    Random random(20261122);
    for (int turn = 0; turn < 1200; ++turn) {
        conf_rules::Words words;
        words.text = Text(random);
        words.section = Pick(random, {"global", "Glo Bal", "x", "new", "", "a]b", "\xC3\xA4", "a\nb", "c\\"});
        words.key = Pick(random, {"a", "A ", "work group", "b", "new", "", "#a", "a=b", "\xFF", "a\x01"});
        words.value = Pick(random, {"", "1", "two  words", " blanks ", "a=b", "# c", "\\", "\xC3\xA4", "a\tb", "a\nb"});
        words.size = static_cast<int>(1 + random() % 12);
        ASSERT_EQ(conf_rules::Broken(folder.path(), words), "")
            << testing::PrintToString(words.text) << " [" << words.section << "] " << words.key << "=" << words.value;
    }
    EXPECT_THAT(folder.Names(), testing::IsEmpty());
}

}  // namespace
