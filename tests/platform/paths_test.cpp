#include <VantishPlatform/Paths.h>

#include <gtest/gtest.h>

#include <cstdlib>
#include <optional>
#include <string>

namespace {

// Sets an environment variable for one test and puts back what was there.
class ScopedEnv {
public:
    ScopedEnv(const char* name, const char* value) : name_(name)
    {
        if (const char* old = std::getenv(name))
            old_ = old;
        if (value)
            setenv(name, value, 1);
        else
            unsetenv(name);
    }
    ~ScopedEnv()
    {
        if (old_)
            setenv(name_, old_->c_str(), 1);
        else
            unsetenv(name_);
    }

private:
    const char* name_;
    std::optional<std::string> old_;
};

class Paths : public ::testing::Test {
protected:
    void TearDown() override { VPClearPathRoots(); }
    ScopedEnv system{"VANTISH_SYSTEM_ROOT", nullptr};
    ScopedEnv state{"VANTISH_STATE_ROOT", nullptr};
};

TEST_F(Paths, PrefixEndsAtAPathComponent)
{
    VPSetPathRoot("/var/mobile", "/tmp/state");
    EXPECT_EQ(VPMapPath("/var/mobile/Library/Brenzel/x.db"), "/tmp/state/Library/Brenzel/x.db");
    EXPECT_EQ(VPMapPath("/var/mobile"), "/tmp/state");
    EXPECT_EQ(VPMapPath("/var/mobile/"), "/tmp/state/");
    EXPECT_EQ(VPMapPath("/var/mobileX/file"), "/var/mobileX/file");
    EXPECT_EQ(VPMapPath("/var/mob"), "/var/mob");
    EXPECT_EQ(VPMapPath("/etc/hosts"), "/etc/hosts");
    EXPECT_EQ(VPMapPath("relative/var/mobile"), "relative/var/mobile");
}

TEST_F(Paths, LongestPrefixWinsAndTrailingSlashesDoNotMatter)
{
    VPSetPathRoot("/var/mobile/", "/tmp/state/");
    VPSetPathRoot("/var/mobile/Library/Brenzel", "/tmp/cache");
    EXPECT_EQ(VPMapPath("/var/mobile/Library/Brenzel/a.db"), "/tmp/cache/a.db");
    EXPECT_EQ(VPMapPath("/var/mobile/Library/BrenzelOld/a.db"), "/tmp/state/Library/BrenzelOld/a.db");

    VPSetPathRoot("/var/mobile/Library/Brenzel", ""); // removes that root only
    EXPECT_EQ(VPMapPath("/var/mobile/Library/Brenzel/a.db"), "/tmp/state/Library/Brenzel/a.db");
    VPSetPathRoot("/var/mobile", "/tmp/other"); // replaces
    EXPECT_EQ(VPMapPath("/var/mobile/a"), "/tmp/other/a");
    VPSetPathRoot("/var/mobile", "/");
    EXPECT_EQ(VPMapPath("/var/mobile/a"), "/a");
    EXPECT_EQ(VPMapPath("/var/mobile"), "/");
}

TEST_F(Paths, EnvironmentFillsInTheStandardRoots)
{
    ScopedEnv systemRoot("VANTISH_SYSTEM_ROOT", "/opt/plugins");
    ScopedEnv stateRoot("VANTISH_STATE_ROOT", "/srv/state/");
    EXPECT_EQ(VPMapPath("/System/Library/HIDPlugins/Vantish.plugin/bzlight.sqlite"),
              "/opt/plugins/Vantish.plugin/bzlight.sqlite");
    EXPECT_EQ(VPMapPath("/var/mobile/Library/Brenzel"), "/srv/state/Library/Brenzel");

    VPSetPathRoot("/var/mobile", "/tmp/state"); // a set root beats the environment
    EXPECT_EQ(VPMapPath("/var/mobile/Library/Brenzel"), "/tmp/state/Library/Brenzel");
    EXPECT_EQ(VPMapPath("/System/Library/HIDPlugins/x"), "/opt/plugins/x");
    VPClearPathRoots();
    EXPECT_EQ(VPMapPath("/var/mobile/Library/Brenzel"), "/srv/state/Library/Brenzel");
}

TEST_F(Paths, WithoutRootsPathsAreUnchanged)
{
    EXPECT_EQ(VPMapPath("/var/mobile/Library/Brenzel"), "/var/mobile/Library/Brenzel");
    ScopedEnv empty("VANTISH_STATE_ROOT", "");
    EXPECT_EQ(VPMapPath("/var/mobile/Library/Brenzel"), "/var/mobile/Library/Brenzel");
    VPSetPathRoot("/", "/tmp/everything"); // the root folder itself is never mapped
    EXPECT_EQ(VPMapPath("/etc/hosts"), "/etc/hosts");
}

} // namespace
