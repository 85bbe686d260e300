// Prints the message texts that the library builds, one of each form.

#include <iostream>
#include <list>
#include <string>

#include <zarl/core.h>

namespace {

void Show(const char* title, const std::string& text) {
    std::cout << "== " << title << " (" << text.size() << " bytes)\n" << text << "\n\n";
}

}  // namespace

int main() {
    using namespace zarl::core;

    Show("Request",
         ZARLRequest("Volume", "Mount", "cli", "17", "/shares/a", "docs", "<Option Name = \"ro\"/>")
             .str());
    Show("Response",
         ZARLResponse("Volume", "Mount", "cli", "17", "/shares/a", "docs", "ok", "", "<Mounted/>")
             .str());
    const std::list<std::string> items = {" Health = \"good\"", " Usage = \"42%\">"};
    Show("Response to GetStatus (list form)",
         ZARLResponse("Volume", "GetStatus", "cli", "18", "/shares/a", "", "ok", "", items).str());
    Show("Failed response", ZARLFailedResponse("Volume", "Mount", "cli", "19", "/shares/b", "docs",
                                               "mount point %s is busy (%d users)", "/shares/b", 3)
                                .str());
    return 0;
}
