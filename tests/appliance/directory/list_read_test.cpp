#include <sys/stat.h>

#include <algorithm>
#include <ctime>
#include <limits>

#include "appliance/base/paths.h"
#include "appliance/base/sqlite.h"
#include "appliance/domain/directory/directory_store.h"
#include "appliance/domain/directory/list_writer.h"
#include "tests/appliance/directory/directory_test.h"

namespace appliance_test {
namespace {

using appliance::EntryKind;
using appliance::EntryPage;
using appliance::ListWriter;
using appliance::ReadEntries;
using testing::Test;
using Names = std::vector<std::string>;

class ListReadTest : public DirectoryTest {
protected:
    static Names Found(const std::string& search) {
        Names names;
        const auto page = ReadEntries(EntryKind::User, "LAB", 0, 1000, search);
        EXPECT_TRUE(page);
        for (const auto& entry : page->entries) {
            names.push_back(entry.name);
        }
        EXPECT_EQ(page->total, static_cast<std::int64_t>(names.size()));
        return names;
    }
};

TEST_F(ListReadTest, AnswersWhatWasWritten) {
    const std::int64_t before = time(nullptr);
    ListWriter writer(EntryKind::User, "lab");
    writer.Add("zoe", 1001234, "Zoe \xC3\x84pfel");
    writer.Add("Alice", std::nullopt, "");
    ASSERT_TRUE(writer.Publish("ldap", "dc1.lab.test"));
    EXPECT_EQ(writer.count(), 2);

    const auto page = ReadEntries(EntryKind::User, "LAB", 0, 10);
    ASSERT_TRUE(page);
    EXPECT_EQ(page->total, 2);
    EXPECT_EQ(page->list.domain, "LAB");
    EXPECT_EQ(page->list.count, 2);
    EXPECT_EQ(page->list.source, "ldap");
    EXPECT_EQ(page->list.controller, "dc1.lab.test");
    EXPECT_GE(page->list.fetched, before);
    EXPECT_LE(page->list.fetched, time(nullptr));
    ASSERT_EQ(page->entries.size(), 2u);
    EXPECT_EQ(page->entries[0].name, "Alice");  // in the order of an index, whatever the case
    EXPECT_FALSE(page->entries[0].id);
    EXPECT_EQ(page->entries[1].name, "zoe");
    EXPECT_EQ(page->entries[1].id, 1001234);
    EXPECT_EQ(page->entries[1].display, "Zoe \xC3\x84pfel");
    EXPECT_FALSE(ReadEntries(EntryKind::Group, "LAB", 0, 10));
    EXPECT_FALSE(ReadEntries(EntryKind::User, "OTHER", 0, 10));
}

TEST_F(ListReadTest, GivesPages) {
    Names names;
    for (int number = 100; number < 130; ++number) {
        names.push_back("user" + std::to_string(number));
    }
    Publish(EntryKind::User, "LAB", names);
    const auto page = ReadEntries(EntryKind::User, "LAB", 10, 5);
    ASSERT_TRUE(page);
    EXPECT_EQ(page->total, 30);
    ASSERT_EQ(page->entries.size(), 5u);
    EXPECT_EQ(page->entries.front().name, "user110");
    EXPECT_TRUE(ReadEntries(EntryKind::User, "LAB", 30, 5)->entries.empty());
    EXPECT_TRUE(ReadEntries(EntryKind::User, "LAB", 0, 0)->entries.empty());
    EXPECT_TRUE(ReadEntries(EntryKind::User, "LAB", 0, -1)->entries.empty());
    EXPECT_EQ(ReadEntries(EntryKind::User, "LAB", -7, 2)->entries.front().name, "user100");
    const auto found = ReadEntries(EntryKind::User, "LAB", 1, 1, "USER11");
    EXPECT_EQ(found->total, 10);
    EXPECT_EQ(found->entries.front().name, "user111");
}

TEST_F(ListReadTest, SearchesNamesAndDisplayNames) {
    ListWriter writer(EntryKind::User, "LAB");
    writer.Add("alice", 1, "Alice Liddell");
    writer.Add("J\xC3\x9CRGEN", 2, "Sales 100%");
    writer.Add("under_score", 3, "O'Brien");
    writer.Add("plain", 4, "[x]* ?");
    ASSERT_TRUE(writer.Publish("ldap", "dc"));
    EXPECT_EQ(Found("LIDD"), Names{"alice"});
    EXPECT_EQ(Found("j\xC3\xBCrg"), Names{"J\xC3\x9CRGEN"});
    EXPECT_EQ(Found("%"), Names{"J\xC3\x9CRGEN"});  // no wildcards
    EXPECT_EQ(Found("_"), Names{"under_score"});
    EXPECT_EQ(Found("'"), Names{"under_score"});
    EXPECT_EQ(Found("[x]*"), Names{"plain"});
    EXPECT_EQ(Found("alice\nalice"), Names{});  // not across the two
    EXPECT_EQ(Found("nobody"), Names{});
    EXPECT_EQ(Found("").size(), 4u);
}

TEST_F(ListReadTest, LeavesOutMachinesAndCountsRefusedNames) {
    ListWriter writer(EntryKind::User, "LAB");
    writer.Add("NAS1$", 1, "");
    writer.Add("OTHER$", 2, "a trust");
    writer.Add("a\nb", 3, "");
    writer.Add("a\xFF", 4, "");
    writer.Add("", 5, "");
    writer.Add("alice", 6, "one\ntwo\x01");
    writer.Add("alice", 7, "again");
    ASSERT_TRUE(writer.Publish("ldap", "dc"));
    EXPECT_EQ(writer.refused(), 3);
    EXPECT_EQ(writer.count(), 1);
    const auto page = ReadEntries(EntryKind::User, "LAB", 0, 10);
    ASSERT_EQ(page->entries.size(), 1u);
    EXPECT_EQ(page->entries[0].id, 7);
    EXPECT_EQ(page->list.count, 1);
}

TEST_F(ListReadTest, KeepsOddNamesAsTheyAre) {
    const Names odd = {"' OR 1=1 --", "-rf", "../up", "Domain Users", "a\"b", "semi;colon", "\xF0\x9F\x90\xA7"};
    Publish(EntryKind::Group, "LAB", odd);
    Names listed = Listed(EntryKind::Group, "LAB");
    Names sorted = odd;
    std::sort(sorted.begin(), sorted.end());
    std::sort(listed.begin(), listed.end());
    EXPECT_EQ(listed, sorted);
}

TEST_F(ListReadTest, RefusesDomainsThatCannotBeFileNames) {
    Publish(EntryKind::User, "LAB", {"alice"});
    for (const char* domain : {"", "../LAB", "LAB/../LAB", ".", "..", "A\nB", "WAYTOOLONGFORANAME", "LAB:x", "L*B"}) {
        EXPECT_FALSE(appliance::IsListDomain(domain)) << domain;
        EXPECT_FALSE(ReadEntries(EntryKind::User, domain, 0, 1)) << domain;
        EXPECT_FALSE(appliance::FindList(EntryKind::User, domain)) << domain;
    }
    EXPECT_TRUE(ReadEntries(EntryKind::User, "lab", 0, 1));
}

TEST_F(ListReadTest, FindsTheListsAndPassesOverWhatIsNone) {
    Publish(EntryKind::Group, "LAB", {"staff", "sales"});
    Publish(EntryKind::User, "OTHER", {"zed"});
    Publish(EntryKind::User, "LAB", {"alice"});
    const std::string data = appliance::Path(appliance::kDirectoryData) + "/";
    Put(data + "user_BROKEN.db", "this is no database");
    Put(data + ".user_LAB.db.AbCdEf", "unfinished");
    Put(data + "user_.db", "");
    Put(data + "notes.txt", "");
    ASSERT_EQ(symlink("/etc/passwd", (data + "user_LINK.db").c_str()), 0);
    const auto lists = appliance::FindLists();
    ASSERT_EQ(lists.size(), 3u);
    EXPECT_EQ(lists[0].kind, EntryKind::User);
    EXPECT_EQ(lists[0].domain, "LAB");
    EXPECT_EQ(lists[1].domain, "OTHER");
    EXPECT_EQ(lists[2].kind, EntryKind::Group);
    EXPECT_EQ(lists[2].count, 2);
    EXPECT_THROW(ReadEntries(EntryKind::User, "BROKEN", 0, 1), appliance::SqliteError);
    EXPECT_FALSE(ReadEntries(EntryKind::User, "LINK", 0, 1));
}

TEST_F(ListReadTest, RemovesTheListsOfOtherDomains) {
    Publish(EntryKind::User, "LAB", {"alice"});
    Publish(EntryKind::User, "OTHER", {"zed"});
    Publish(EntryKind::Group, "OTHER", {"zgroup"});
    EXPECT_EQ(appliance::RemoveLists({"lab"}), 2);
    EXPECT_EQ(Listed(EntryKind::User, "LAB"), Names{"alice"});
    EXPECT_EQ(Listed(EntryKind::User, "OTHER"), Names{"<none>"});
    EXPECT_EQ(Got(appliance::ListLinkPath(EntryKind::Group, "OTHER")), "<missing>");
    EXPECT_EQ(appliance::RemoveLists(), 1);
    EXPECT_TRUE(appliance::FindLists().empty());
    EXPECT_EQ(appliance::RemoveLists(), 0);
}

std::int64_t ThreadMilliseconds() {
    timespec time{};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
    return time.tv_sec * 1000 + time.tv_nsec / 1000000;
}

TEST_F(ListReadTest, SearchesAHundredThousandEntriesQuickly) {
    ListWriter writer(EntryKind::User, "LAB");
    for (int number = 0; number < 100000; ++number) {
        const std::string digits = std::to_string(1000000 + number).substr(1);
        writer.Add("user" + digits, number, "Given" + digits + " Surname" + std::to_string(number % 977));
    }
    ASSERT_TRUE(writer.Publish("ldap", "dc"));
    for (const char* search : {"", "surname976", "GIVEN099999", "nobody at all", "e"}) {
        for (const std::int64_t offset : {0, 99000}) {
            // The processor's time, best of three: what else the machine does is not the list's doing.
            std::int64_t best = std::numeric_limits<std::int64_t>::max();
            for (int round = 0; round < 3; ++round) {
                const std::int64_t started = ThreadMilliseconds();
                ASSERT_TRUE(ReadEntries(EntryKind::User, "LAB", offset, 1000, search));
                best = std::min(best, ThreadMilliseconds() - started);
            }
            EXPECT_LT(best, 200) << search;
        }
    }
    EXPECT_EQ(ReadEntries(EntryKind::User, "LAB", 0, 1, "SURNAME976")->total, 102);
}

}  // namespace
}  // namespace appliance_test
