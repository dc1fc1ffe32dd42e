// Stamps keep times as one count of nanoseconds in the store: the count must
// come back as the same time, in the form every timespec reader expects.
#include <gtest/gtest.h>

#include <cstdint>

#include "platform/file_stamp.h"

using namespace qr;

TEST(FileStamp, NanosecondCountsComeBackAsNormalTimes) {
  // clang-format off
  const int64_t counts[] = {0, 1, 999'999'999, 1'000'000'000, 1'796'596'708'954'117'292, -1,
                            -999'999'999, -1'000'000'001, INT64_MAX, -9'000'000'000'000'000'000};
  // clang-format on
  for (int64_t count : counts) {
    timespec t = fromNanoseconds(count);
    EXPECT_TRUE(t.tv_nsec >= 0 && t.tv_nsec < 1'000'000'000) << count;
    EXPECT_EQ(nanoseconds(t), count);
  }
}
