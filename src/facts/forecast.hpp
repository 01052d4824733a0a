// What samples of a volume, or of a user's space below a quota, say about when it is full.
//
// Pure functions: no clock, and of the process only its time zone in daily_samples().
#pragma once

#include <cstdint>
#include <span>
#include <vector>

#include "report_format/facts.hpp"

namespace vornreport {

// One sample a day of the last 90 days up to and including `now`, oldest first: of each calendar
// day in the process's time zone (a day on which clocks change is one) the median of what was used,
// at the median of the times; between the two middle ones of an even number, rounded down. At most
// 90, the newest. `samples` come in any order; those later than `now` are left out, for they are
// from a clock that was ahead.
std::vector<report_format::Sample> daily_samples(std::vector<report_format::Sample> samples,
                                                 std::int64_t now);

// What is ahead of a volume or quota of `size` bytes with `free` of them free at the last sample.
// `daily` comes from daily_samples(); times that don't rise are survived.
//
// kFull      nothing is free, whatever the samples say
// kShort     fewer than 4 samples, or less than 7 days between the first and the last
// kGrowing   the slopes of the trend agree on growth, and it would be full in 3650 days at most
// kShrinking the slopes agree that it empties
// kSteady    all the rest
//
// The trend is that of the last 30 days, or of all samples where those days alone would be kShort:
// the median of the slopes between all pairs of samples that lie at least 7 days apart (1 day when
// it rests on less than 14 days). 3 hours less are as good, so that the runs of a schedule count,
// which are not a second's worth regular and have a day of 23 hours each year. Slopes agree when
// their 20th and their 80th percentile lie on one side of zero, each at least 0.02 % of the size a
// day away from it.
//
// A percentile lies between two of the sorted slopes, interpolated linearly. Slopes between n
// samples are n(n-1)/2, but no more than n-1 of them tell something of their own, and so
// percentiles are taken where those of n-1 figures lie: the 20th at (0.2 n - 1) / (n - 2) of the
// way from the smallest to the largest, which is the smallest for up to five samples and the 18th
// percentile of all for 31. As those of all slopes they would lie too close together to hold what
// weekly samples leave open (measured by bench/forecast_backtest.cpp).
//
// A jump is a change between neighbouring samples of more than 2 % of the size that, by the day, is
// more than 8 times the median change, with no other such change of its direction within 45 days.
// It is taken out of the trend by leaving out the pairs that it lies between: a difference of two
// samples has their noise, and what follows would stand that much too high or low if the difference
// were subtracted. Where no pair is left, the volume is steady at 0 bytes a day. The newest jump of
// the 14 days before the last sample is told in every state; its date is that of the later sample.
//
// `days` is rounded down, `days_low` too, `days_high` up and at most 36500. `window` is 0 for
// kFull; for kShort it is that of all samples, rounded down, otherwise that of the trend, rounded
// to the nearest day: the runs of 30 days don't come at the same second.
report_format::Forecast forecast(std::span<const report_format::Sample> daily, std::uint64_t size,
                                 std::uint64_t free);

// How pressing a volume is of which `percent` are used. Days alone never press: a volume that is
// mostly free has time.
report_format::Level volume_level(double percent, const report_format::Forecast& forecast);

// The same of a user's quota; `forecast` may be null.
report_format::Level quota_level(double percent, const report_format::Forecast* forecast);

}  // namespace vornreport
