#include "appliance/tools/vornctl/catalogue.h"

#include "appliance/tools/vornctl/client.h"
#include "appliance/tools/vornctl/embedded.h"

namespace appliance::ctl {

namespace {

std::map<int, ErrorText> ReadErrorTexts() {
    Json::Value catalogue;
    ParseJson(kEmbeddedErrorCodes, catalogue);
    std::map<int, ErrorText> texts;
    for (const Json::Value& entry : ListOf(catalogue, "codes")) {
        texts[static_cast<int>(NumberOf(entry, "code"))] = {TextOf(entry, "meaning"), TextOf(entry, "cause"),
                                                            TextOf(entry, "action")};
    }
    return texts;
}

Json::Value ReadMethods() {
    Json::Value catalogue;
    ParseJson(kEmbeddedMethods, catalogue);
    return catalogue;
}

}  // namespace

const std::map<int, ErrorText>& ErrorTexts() {
    static const std::map<int, ErrorText> texts = ReadErrorTexts();
    return texts;
}

const ErrorText* FindErrorText(int code) {
    const auto found = ErrorTexts().find(code);
    return found == ErrorTexts().end() ? nullptr : &found->second;
}

const Json::Value& MethodCatalogue() {
    static const Json::Value catalogue = ReadMethods();
    return catalogue;
}

}  // namespace appliance::ctl
