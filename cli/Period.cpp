#include "cli/Period.h"

#include <chrono>
#include <ctime>
#include <regex>

namespace cli {
namespace {

constexpr int kDay = 24 * 60 * 60;

int numberIn(const std::smatch& match, std::size_t group) {
  return match[group].matched ? std::stoi(match[group].str()) : 0;
}

// A moment of the local time zone; days and seconds beyond their month and day go on with the next.
long long localMoment(int year, int month, int day, int second) {
  std::tm parts{};
  parts.tm_year = year - 1900;
  parts.tm_mon = month - 1;
  parts.tm_mday = day;
  parts.tm_hour = second / 3600;
  parts.tm_min = second / 60 % 60;
  parts.tm_sec = second % 60;
  parts.tm_isdst = -1;
  return std::mktime(&parts);
}

}  // namespace

base::Result<Period> periodFrom(const std::string& text) {
  static const std::regex kForm(
      R"((\d{4})-(\d{2})-(\d{2})(?:[T ](\d{2}):(\d{2})(?::(\d{2}))?(?:(Z)|([+-])(\d{2}):(\d{2}))?)?)");
  const base::Failure wrong{
      base::FailureKind::kInvalid,
      "A time is written 2024-05-01 or 2024-05-01T12:30:00, and may end with Z or +02:00"};
  std::smatch match;
  if (!std::regex_match(text, match, kForm)) return wrong;
  const int year = numberIn(match, 1);
  const int month = numberIn(match, 2);
  const int day = numberIn(match, 3);
  const std::chrono::year_month_day date{std::chrono::year(year),
                                         std::chrono::month(static_cast<unsigned>(month)),
                                         std::chrono::day(static_cast<unsigned>(day))};
  const bool isTimeOfDay = numberIn(match, 4) < 24 && numberIn(match, 5) < 60 && numberIn(match, 6) < 60;
  const bool isOffset = numberIn(match, 9) < 24 && numberIn(match, 10) < 60;
  if (!date.ok() || !isTimeOfDay || !isOffset) return wrong;
  if (!match[4].matched)
    return Period{localMoment(year, month, day, 0), localMoment(year, month, day + 1, 0) - 1};

  const int second = numberIn(match, 4) * 3600 + numberIn(match, 5) * 60 + numberIn(match, 6);
  const int offset = (numberIn(match, 9) * 3600 + numberIn(match, 10) * 60) * (match[8] == "-" ? -1 : 1);
  const bool hasZone = match[7].matched || match[8].matched;
  const long long first =
      hasZone ? static_cast<long long>(std::chrono::sys_days(date).time_since_epoch().count()) * kDay +
                    second - offset
              : localMoment(year, month, day, second);
  return Period{first, first + (match[6].matched ? 0 : 59)};
}

}  // namespace cli
