// The page's files: which there are, and in which form they are sent.

#include "appliance/httpd/page.h"

#include <gmock/gmock.h>
#include <sys/stat.h>

#include "tests/appliance/httpd/support.h"

namespace httpd_test {
namespace {

using appliance::DoorReply;
using appliance::Page;
using Fields = boost::beast::http::fields;

std::string FieldOf(const DoorReply& reply, const std::string& name) {
    for (const auto& [field, value] : reply.fields) {
        if (field == name) {
            return value;
        }
    }
    return "none";
}

class PageTest : public ::testing::Test {
protected:
    PageTest() {
        WritePage(folder_);
    }
    std::unique_ptr<DoorReply> Find(const std::string& path, const std::string& accept = {},
                                    const std::string& match = {}) {
        if (page_ == nullptr) {
            page_ = std::make_unique<Page>(folder_.At("page"));
        }
        Fields fields;
        fields.insert("Accept-Encoding", accept);
        if (!match.empty()) {
            fields.insert("If-None-Match", match);
        }
        return page_->Find(path, fields);
    }

    Folder folder_;
    std::unique_ptr<Page> page_;
};

TEST_F(PageTest, TheIndexIsAskedForEachTime) {
    const auto reply = Find("/");
    ASSERT_NE(reply, nullptr);
    EXPECT_EQ(reply->status, 200);
    EXPECT_EQ(reply->Content(), "<!doctype html><title>page</title>");
    EXPECT_EQ(reply->type, "text/html; charset=utf-8");
    EXPECT_EQ(FieldOf(*reply, "Cache-Control"), "no-cache");
    EXPECT_THAT(FieldOf(*reply, "ETag"), ::testing::MatchesRegex("\"[0-9a-f]{24}\""));
    EXPECT_EQ(FieldOf(*reply, "Vary"), "none");
    EXPECT_EQ(Find("/index.html")->Content(), reply->Content());
}

TEST_F(PageTest, AssetsLast) {
    const auto reply = Find("/assets/app.js");
    EXPECT_EQ(FieldOf(*reply, "Cache-Control"), "public, max-age=31536000, immutable");
    EXPECT_EQ(reply->type, "text/javascript; charset=utf-8");
    EXPECT_EQ(FieldOf(*reply, "Vary"), "Accept-Encoding");
    EXPECT_EQ(FieldOf(*reply, "Content-Encoding"), "none");
    EXPECT_EQ(reply->Content(), std::string(100000, 'a'));
}

TEST_F(PageTest, OtherFormsByWhatTheClientTakes) {
    EXPECT_EQ(Find("/assets/app.js", "gzip, br")->Content(), "as brotli");
    EXPECT_EQ(FieldOf(*Find("/assets/app.js", "gzip, br"), "Content-Encoding"), "br");
    EXPECT_EQ(Find("/assets/app.js", "gzip")->Content(), "as gzip");
    EXPECT_EQ(FieldOf(*Find("/assets/app.js", "gzip"), "Content-Encoding"), "gzip");
    EXPECT_EQ(Find("/assets/app.js", "br")->type, "text/javascript; charset=utf-8");
    EXPECT_EQ(Find("/", "gzip, br")->Content(), "<!doctype html><title>page</title>");
    EXPECT_EQ(Find("/assets/app.js.br"), nullptr) << "a form is no file of its own";
}

TEST_F(PageTest, EveryFormHasItsTag) {
    const std::string plain = FieldOf(*Find("/assets/app.js"), "ETag");
    const std::string brotli = FieldOf(*Find("/assets/app.js", "br"), "ETag");
    EXPECT_NE(plain, brotli);
    const auto same = Find("/assets/app.js", "br", brotli);
    EXPECT_EQ(same->status, 304);
    EXPECT_EQ(same->Content(), "");
    EXPECT_EQ(FieldOf(*same, "ETag"), brotli);
    EXPECT_EQ(Find("/assets/app.js", "br", plain)->status, 200);
    folder_.Write("page/assets/app.js.br", "as Brotli");
    page_.reset();
    EXPECT_NE(FieldOf(*Find("/assets/app.js", "br"), "ETag"), brotli) << "other content, other tag";
}

TEST_F(PageTest, NothingElseIsThere) {
    folder_.Write("outside.txt", "outside");
    folder_.Write("page/odd name.txt", "odd");
    folder_.Write("page/.htaccess", "odd");
    ASSERT_EQ(symlink(folder_.At("outside.txt").c_str(), folder_.At("page/link.txt").c_str()), 0);
    ASSERT_EQ(symlink(folder_.path().c_str(), folder_.At("page/folder").c_str()), 0);
    ASSERT_EQ(mkfifo(folder_.At("page/pipe.txt").c_str(), 0644), 0);
    for (const char* path : {"",
                             "/.",
                             "/..",
                             "//",
                             "/../outside.txt",
                             "/assets/../../outside.txt",
                             "/%2e%2e/outside.txt",
                             "/..%2foutside.txt",
                             "/link.txt",
                             "/folder/outside.txt",
                             "/pipe.txt",
                             "/assets",
                             "/assets/",
                             "/secret/.hidden",
                             "/.htaccess",
                             "/odd name.txt",
                             "/odd%20name.txt",
                             "index.html",
                             "//index.html",
                             "/index.html/",
                             "/INDEX.HTML",
                             "/index.html.",
                             "/assets\\app.js"}) {
        EXPECT_EQ(Find(path), nullptr) << path;
    }
    EXPECT_EQ(Find(std::string("/index.html\0", 12)), nullptr);
}

TEST_F(PageTest, FilesThatChangeUnderIt) {
    const std::string tag = FieldOf(*Find("/assets/app.js"), "ETag");
    folder_.Write("page/assets/app.js", "");
    EXPECT_EQ(Find("/assets/app.js")->Content(), std::string(100000, 'a')) << "as it was at the start, like its tag";
    EXPECT_EQ(FieldOf(*Find("/assets/app.js"), "ETag"), tag);
}

TEST_F(PageTest, AMissingFolderIsAnEmptyPage) {
    const Page page(folder_.At("missing"));
    EXPECT_EQ(page.size(), 0u);
    EXPECT_EQ(page.Find("/", Fields()), nullptr);
}

TEST_F(PageTest, AnEmptyFileIsOne) {
    folder_.Write("page/empty.txt", "");
    const auto reply = Find("/empty.txt");
    ASSERT_NE(reply, nullptr);
    EXPECT_EQ(reply->status, 200);
    EXPECT_EQ(reply->Content(), "");
}

}  // namespace
}  // namespace httpd_test
