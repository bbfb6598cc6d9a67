// The page's files. They are read once, at the start, and nothing else is ever opened: no path leads out of them, and what
// becomes of them on the disk while they are served does no harm.

#ifndef VORN_APPLIANCE_HTTPD_PAGE_H
#define VORN_APPLIANCE_HTTPD_PAGE_H

#include <cstddef>
#include <map>
#include <memory>
#include <string>
#include <string_view>

#include "appliance/httpd/client_request.h"
#include "appliance/httpd/door_reply.h"

namespace appliance {

class Page {
public:
    // Takes every file in the folder and below whose name is plain (letters, digits, "-", "_", "."; no dot in front), no
    // symbolic links. FILE.br and FILE.gz are other forms of FILE. What can't be read is logged and left out.
    explicit Page(const std::string& folder);

    std::size_t size() const {
        return files_.size();
    }

    // The answer to GET or HEAD of a path; null when there is no such file. "/" is index.html.
    std::unique_ptr<DoorReply> Find(std::string_view path, const boost::beast::http::fields& header) const;

private:
    struct Form {
        bool isThere = false;
        std::string content;
        std::string tag;
    };
    struct Entry {
        Form plain;
        Form brotli;
        Form gzip;
        std::string_view type;
        bool isLasting = false;  // its name changes with its content
    };

    void TakeFolder(int folder, const std::string& path, int depth);
    void TakeFile(int folder, const std::string& path, const std::string& name);

    std::map<std::string, Entry, std::less<>> files_;
    std::size_t bytes_ = 0;  // of all of them
};

}  // namespace appliance

#endif
