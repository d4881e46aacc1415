#include "hooks/Hooks.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <sstream>

#include "support/HttpServer.h"
#include "support/TemporaryFolder.h"

namespace receiver {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;

TEST(HooksTest, ProgramAndServerHearTheSameEvents) {
    setenv("no_proxy", "*", 1);
    const endtoend::TemporaryFolder folder;
    const std::string out = (folder.Path() / "out").string();
    const std::string script = (folder.Path() / "hook").string();
    std::ofstream(script) << "#!/bin/sh\necho \"$CLIPFILE_EVENT $CLIPFILE_PATH$CLIPFILE_TIMECODE\" >> " << out
                          << "\n";
    std::filesystem::permissions(script, std::filesystem::perms::owner_all);
    const HttpServer server({200});
    Hooks hooks(script, server.Url());
    hooks.Display().Notice("nobody is told of this");
    hooks.Display().RecordStarted({10, 0, 0, 0, false});
    hooks.Display().FileClosed("/srv/a.MP4");
    hooks.Settle();
    EXPECT_THAT(hooks.TakeSentences(), IsEmpty());
    EXPECT_EQ(hooks.Counts().delivered, 4u);
    std::ostringstream text;
    text << std::ifstream(out).rdbuf();
    EXPECT_EQ(text.str(), "record_started 10:00:00:00\nfile_closed /srv/a.MP4\n");
    EXPECT_THAT(server.Requests(), SizeIs(2));
}

TEST(HooksTest, FailuresAreToldAndCounted) {
    Hooks hooks("/nowhere/hook", std::nullopt);
    hooks.Display().FileClosed("/srv/a.MP4");
    hooks.Settle();
    EXPECT_THAT(hooks.TakeSentences(), ElementsAre("hook /nowhere/hook was not told of file_closed: it did "
                                                   "not run to its end: No such file or directory"));
    EXPECT_EQ(hooks.Counts().failed, 1u);
}

}  // namespace
}  // namespace receiver
