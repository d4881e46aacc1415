#include "ModuleReport.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "fakes/FakeDisplay.h"

namespace receiver {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Kind = ModuleEvent::Kind;
using WrittenFile = ModuleReport::WrittenFile;

class ModuleReportTest : public ::testing::Test {
 protected:
    FakeDisplay display_;
    ModuleReport report_{display_};
};

TEST_F(ModuleReportTest, AStatusThatIsRepeatedIsToldOnce) {
    report_.Tell({{4, 0}, {4, 0}, {3, 0}}, false);
    report_.Tell({{3, 0}, {4, 0}}, false);
    EXPECT_THAT(display_.statuses, ElementsAre(ModuleStatus{4, 0}, ModuleStatus{3, 0}, ModuleStatus{4, 0}));
}

TEST_F(ModuleReportTest, FaultsAreCountedAlsoWhenTheyAreRepeated) {
    report_.Tell({{6, 22}, {6, 22}, {6, 26}}, false);
    EXPECT_EQ(report_.Faults(), 3u);
}

TEST_F(ModuleReportTest, GoingOfflineAtTheEndOfASessionIsNoFault) {
    report_.Tell({{6, 26}, {6, 23}}, true);
    EXPECT_EQ(report_.Faults(), 1u);
    EXPECT_THAT(display_.statuses, ElementsAre(ModuleStatus{6, 23}));
}

TEST_F(ModuleReportTest, FilesAreKeptInTheirOrderWithTheirEnd) {
    report_.Tell({{Kind::kFileOpened, "a"}, {Kind::kFileOpened, "b"}, {Kind::kFileClosed, "a"}});
    EXPECT_THAT(report_.Files(), ElementsAre(WrittenFile{"a", true}, WrittenFile{"b", false}));
    EXPECT_EQ(report_.OpenFile(), "b");
    report_.Tell({{Kind::kFileClosed, "b"}});
    EXPECT_EQ(report_.OpenFile(), "");
    EXPECT_THAT(display_.opened, ElementsAre("a", "b"));
    EXPECT_THAT(display_.closed, ElementsAre("a", "b"));
}

TEST_F(ModuleReportTest, RestartsAndErrorsAreNoticesAndTheRestIsNot) {
    report_.Tell({{Kind::kRecordStarted, {}},
                  {Kind::kRecordRestarted, {}},
                  {Kind::kError, "no disk"},
                  {Kind::kRecordStopped, {}},
                  {Kind::kRecordRemoved, {}}});
    EXPECT_THAT(display_.notices,
                ElementsAre("the recording begins anew after a fault", "module log: no disk"));
    EXPECT_THAT(report_.Files(), IsEmpty());
}

}  // namespace
}  // namespace receiver
