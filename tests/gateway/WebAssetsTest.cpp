#include "gateway/WebAssets.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <regex>
#include <set>
#include <sstream>
#include <string>

namespace maroset::gateway {
namespace {

namespace fs = std::filesystem;

std::string contentOf(const fs::path& file) {
    std::ifstream in(file, std::ios::binary);
    std::ostringstream out;
    out << in.rdbuf();
    return out.str();
}

// The files in the binary are the page's sources, each whole and with its type, and nothing
// a browser asks for leads anywhere else.
TEST(WebAssets, ServesEveryFileOfThePageByteForByteWithItsType) {
    std::set<std::string> onDisk;
    for (const auto& entry : fs::directory_iterator(MAROSET_WEB_DIR)) {
        const std::string name = entry.path().filename().string();
        const std::string path = name == "index.html" ? "/" : "/" + name;
        onDisk.insert(path);
        const WebAssets::File* file = WebAssets::Find(path);
        ASSERT_NE(file, nullptr) << path;
        EXPECT_EQ(file->bytes, contentOf(entry.path())) << path;
    }
    std::set<std::string> embedded;
    for (const auto& file : WebAssets::Files()) embedded.emplace(file.path);
    EXPECT_EQ(embedded, onDisk);

    EXPECT_EQ(WebAssets::Find("/")->contentType, "text/html; charset=utf-8");
    EXPECT_EQ(WebAssets::Find("/app.js")->contentType, "text/javascript; charset=utf-8");
    EXPECT_EQ(WebAssets::Find("/style.css")->contentType, "text/css; charset=utf-8");
    for (const char* path : {"", "app.js", "/APP.JS", "/app.js?x=1", "/../app.js", "/web/app.js"})
        EXPECT_EQ(WebAssets::Find(path), nullptr) << path;
}

// The page works with what the binary holds: everything it links to is embedded and nothing
// is fetched from another host.
TEST(WebAssets, PageReferencesOnlyEmbeddedFiles) {
    const std::regex reference(R"re((?:src|href)="([^"]*)")re");
    for (const auto& file : WebAssets::Files()) {
        const std::string text(file.bytes);
        EXPECT_EQ(text.find("http://"), std::string::npos) << file.path;
        EXPECT_EQ(text.find("https://"), std::string::npos) << file.path;
        EXPECT_EQ(text.find("//cdn"), std::string::npos) << file.path;
    }
    const std::string index(WebAssets::Find("/")->bytes);
    int local = 0;
    for (std::sregex_iterator it(index.begin(), index.end(), reference), end; it != end; ++it) {
        const std::string target = (*it)[1];
        if (target.starts_with("data:")) continue;
        EXPECT_NE(WebAssets::Find("/" + target), nullptr) << target;
        ++local;
    }
    EXPECT_EQ(local, 2);  // the script and the style sheet
}

}  // namespace
}  // namespace maroset::gateway
