#include "plr/qf/plist_adapter.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <fstream>
#include <string>

#include "plr/qf/make_qf_string.h"
#include "support/scratch_folder.h"

namespace {

using plr::qf::MakeQfString;
using plr::qf::plist_adapter;

TEST(PlistAdapter, ReadsWhatItsUserHasOnThisHost) {
    const plr::test::ScratchFolder folder;
    char host[256] = {};
    ASSERT_EQ(::gethostname(host, sizeof host - 1), 0);
    for (const char* layer : {"VENDOR", "SYSTEM", "USER"}) {
        const std::string name = std::string("PELORIN_PREFERENCES_") + layer;
        const std::string path = folder.at(layer);
        ASSERT_EQ(::mkdir(path.c_str(), 0700), 0);
        ASSERT_EQ(::setenv(name.c_str(), path.c_str(), 1), 0);
    }
    std::ofstream(folder.at("SYSTEM/test.toml")) << "baud = 9600\nbars = 1\n";
    std::ofstream(folder.at("USER/test.toml")) << "baud = 115200\nname = \"any host\"\n";
    std::ofstream(folder.at("USER/test@" + std::string(host) + ".toml")) << "name = \"this\"\n";

    const MakeQfString baud("baud");
    const MakeQfString name("name");
    const plist_adapter current{MakeQfString("test")};
    EXPECT_EQ(current.getInt(baud, 0), 115200);
    EXPECT_EQ(current.getString(name, ""), "this");
    EXPECT_EQ(current.getInt(MakeQfString("bars"), 0), 1);
    EXPECT_EQ(current.getInt(MakeQfString("other"), 5), 5);
    const plist_adapter any(MakeQfString("test"), kQfPreferencesAnyUser);
    EXPECT_EQ(any.getInt(baud, 0), 9600);
    EXPECT_EQ(any.copyQfStringRef(name), nullptr);
    EXPECT_EQ(plist_adapter(nullptr).copyQfTypeRef(baud), nullptr);
}

}  // namespace
