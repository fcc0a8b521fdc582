#include "gateway/WebFiles.h"

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
TEST(WebFiles, ServesEveryFileOfTheFolderByteForByteWithItsType) {
    std::set<std::string> onDisk;
    for (const auto& entry : fs::directory_iterator(MAROSET_WEB_DIR)) {
        const std::string path = "/" + entry.path().filename().string();
        onDisk.insert(path);
        const WebFiles::File* file = WebFiles::find(path);
        ASSERT_NE(file, nullptr) << path;
        EXPECT_EQ(file->bytes, contentOf(entry.path())) << path;
    }
    std::set<std::string> embedded;
    for (const auto& file : WebFiles::all()) embedded.emplace(file.path);
    EXPECT_EQ(embedded, onDisk);

    EXPECT_EQ(WebFiles::find("/index.html")->contentType, "text/html; charset=utf-8");
    EXPECT_EQ(WebFiles::find("/app.js")->contentType, "text/javascript; charset=utf-8");
    EXPECT_EQ(WebFiles::find("/style.css")->contentType, "text/css; charset=utf-8");
}

TEST(WebFiles, RootIsTheIndexAndOtherPathsAreNotFound) {
    EXPECT_EQ(WebFiles::find("/"), WebFiles::find("/index.html"));
    for (const char* path : {"", "index.html", "/INDEX.HTML", "/index.html?x=1", "/../index.html",
                             "/web/index.html", "/app.js/", "/api/tags"})
        EXPECT_EQ(WebFiles::find(path), nullptr) << path;
}

// The page works with what the binary holds: everything it links to is embedded and nothing
// is fetched from another host.
TEST(WebFiles, PageReferencesOnlyEmbeddedFiles) {
    const std::regex reference(R"re((?:src|href)="([^"]*)")re");
    for (const auto& file : WebFiles::all()) {
        const std::string text(file.bytes);
        EXPECT_EQ(text.find("http://"), std::string::npos) << file.path;
        EXPECT_EQ(text.find("https://"), std::string::npos) << file.path;
        EXPECT_EQ(text.find("//cdn"), std::string::npos) << file.path;
    }
    const std::string index(WebFiles::find("/")->bytes);
    int local = 0;
    for (std::sregex_iterator it(index.begin(), index.end(), reference), end; it != end; ++it) {
        const std::string target = (*it)[1];
        if (target.starts_with("data:")) continue;
        EXPECT_NE(WebFiles::find("/" + target), nullptr) << target;
        ++local;
    }
    EXPECT_EQ(local, 2);  // the script and the style sheet
}

}  // namespace
}  // namespace maroset::gateway
