// The estimate of the days until a volume is full.
#include <array>
#include <initializer_list>

#include "db_volume_usage.hpp"
#include "fixture.hpp"
#include "rep_volume_usage.hpp"

namespace vornreport {
namespace {

class VolumeUsageTest : public UnitTest {
 protected:
  ~VolumeUsageTest() override { QAZLLfree(&list_, VolumeUsageFreeNode); }

  // Samples of a volume, the newest first: date, used, free.
  using Sample = std::array<const char*, 3>;
  void add_volume(const char* name, std::initializer_list<Sample> samples) {
    auto* node = new VolumeUsageNode{};
    node->name.format("%s", name);
    VolumeUsageSample** end = &node->samples;
    for (const auto& [date, used, free] : samples) {
      *end = new VolumeUsageSample{};
      (*end)->sampleDate.format("%s", date);
      (*end)->sizeUse.format("%s", used);
      (*end)->sizeFree.format("%s", free);
      (*end)->percent.format("50.0000");
      end = &(*end)->next;
    }
    ASSERT_EQ(QAZLLadd(&list_, node, nullptr), 0);
  }

  QAZLLNode* list_ = nullptr;
};

TEST_F(VolumeUsageTest, EstimatesTheDaysUntilFull) {
  const struct {
    const char* what;
    std::initializer_list<Sample> samples;
    int32_t days;
  } cases[] = {
      {"grew by 1000 a second", {{"2000", "1001000", "864000000"}, {"1000", "1000", "0"}}, 10},
      {"fell", {{"2000", "10", "864000000"}, {"1000", "1000", "0"}}, 0},
      {"level", {{"2000", "10", "864000000"}, {"1000", "10", "0"}}, 0},
      {"same second", {{"2000", "999", "999"}, {"2000", "1", "0"}}, 0},
      {"same second, then older",
       {{"2000", "1001000", "86400000"}, {"2000", "1", "0"}, {"1000", "1000", "0"}},
       1},
      {"below a byte a second", {{"2000", "1500", "999999"}, {"1000", "1000", "0"}}, 0},
      {"newest lower one counts",
       {{"3000", "2001000", "86400000"}, {"2000", "1000", "0"}, {"1000", "0", "0"}},
       0},
      {"clock set back", {{"1000", "1001000", "864000000"}, {"2000", "1000", "0"}}, 0},
      {"full", {{"2000", "1001000", "0"}, {"1000", "1000", "0"}}, 0},
      {"more days than 31 bits hold",
       {{"2000", "2000", "18446744073709551615"}, {"1000", "1000", "0"}},
       static_cast<int32_t>(18446744073709551615ULL / 86400)},
  };
  for (const auto& c : cases) {
    add_volume("/v", c.samples);
    printed([&] { VolumeUsageEstimateDays(list_); });
    EXPECT_EQ(volume_of(list_)->days, c.days) << c.what;
    QAZLLfree(&list_, VolumeUsageFreeNode);
  }
}

// One whose identifier can't be had is left out, as of the page.
TEST_F(VolumeUsageTest, ACsvLineNamesNoPathThatWouldBreakIt) {
  platform.volume_ids = {{"/a\"b", "_a_b"}, {"/a\nb", "_a__b"}};
  for (const char* path : {"/a b, c", "/a\"b", "/a\nb", "/a\tb"}) {
    add_volume(path, {{"1", "40", "60"}});
  }
  const auto profile = support::make_hash({{"real_path_csv", folder_.path()}});
  printed([&] { EXPECT_EQ(VolumeUsageWriteCsv("p", profile.get(), list_), 0); });
  const std::string rest = "\", \"100\" ,\"50.0000%\", \"0\"\n";
  EXPECT_EQ(support::read_file(folder_.path("volume_usage.csv")),
            "\xEF\xBB\xBFVolume, Size, Used, Daty to Full\n\"/a b, c" + rest + "\"_a_b" + rest +
                "\"_a__b" + rest);
}

}  // namespace
}  // namespace vornreport
