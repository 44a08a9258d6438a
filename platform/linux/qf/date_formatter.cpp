#include <langinfo.h>
#include <time.h>

#include <cmath>
#include <string>

#include "platform/linux/qf/value.h"
#include "qf/date.h"

namespace {

// ---- strftime formats of the styles ----------------------------------------------

// With names in place of digits, in the order in which the locale has the digits.
std::string named_date(locale_t locale, const std::string& month) {
    std::string_view digits = nl_langinfo_l(D_FMT, locale);
    if (digits == "%D")
        digits = "%m/%d/%y";
    if (digits == "%F" || digits.find_first_of("Yy") < digits.find('m'))
        return "%Y " + month + " %-d";
    return digits.find('m') < digits.find_first_of("de") ? month + " %-d, %Y"
                                                         : "%-d " + month + " %Y";
}

std::string date_format(locale_t locale, QfDateFormatterStyle style) {
    switch (style) {
        case kQfDateFormatterNoStyle:
            return "";
        case kQfDateFormatterShortStyle:
            return "%x";
        case kQfDateFormatterMediumStyle:
            return named_date(locale, "%b");
        case kQfDateFormatterLongStyle:
            return named_date(locale, "%B");
        case kQfDateFormatterFullStyle:
            return "%A, " + named_date(locale, "%B");
    }
    PLR_ASSERT(false, "no style of dates");
    return "";
}

std::string time_format(locale_t locale, QfDateFormatterStyle style) {
    switch (style) {
        case kQfDateFormatterNoStyle:
            return "";
        case kQfDateFormatterShortStyle: {
            const std::string_view digits = nl_langinfo_l(T_FMT, locale);
            return digits.find_first_of("rpI") == digits.npos ? "%H:%M" : "%I:%M %p";
        }
        case kQfDateFormatterMediumStyle:
            return "%X";
        case kQfDateFormatterLongStyle:
        case kQfDateFormatterFullStyle:
            return "%X %Z";
    }
    PLR_ASSERT(false, "no style of times");
    return "";
}

// noexcept: out of memory ends the process.
QfDateFormatterRef make_formatter(QfLocaleRef locale, QfDateFormatterStyle date,
                                  QfDateFormatterStyle time) noexcept {
    std::string format = date_format(locale->locale, date);
    if (!format.empty() && time != kQfDateFormatterNoStyle)
        format += ' ';
    format += time_format(locale->locale, time);
    return qf::make<qf_date_formatter>(0, locale, qf::make_string(format));
}

// ---- Rendering -------------------------------------------------------------------

// False when the seconds are no time of the calendar.
bool local_time(double seconds, tm& local) noexcept {
    constexpr double kMost = 9.2e18;  // fits time_t, and is beyond every calendar
    if (!(std::abs(seconds) < kMost))
        return false;
    const auto whole = static_cast<time_t>(std::floor(seconds));
    tzset();  // the machine may have travelled
    return localtime_r(&whole, &local) != nullptr;
}

// noexcept: out of memory ends the process.
QfStringRef render(const qf_date_formatter* formatter, const tm& local) noexcept {
    // strftime's 0 means too little room as well as no text: one more character
    // makes sure that there is text.
    const std::string format = std::string(formatter->format->view()) + '.';
    std::string text(64, '\0');
    std::size_t length = 0;
    while ((length = strftime_l(text.data(), text.size(), format.c_str(), &local,
                                formatter->locale->locale)) == 0)
        text.resize(2 * text.size());
    return qf::make_string(std::string_view(text).substr(0, length - 1));
}

}  // namespace

extern "C" {

QfDateFormatterRef qf_date_formatter_create(QfLocaleRef locale, QfDateFormatterStyle date,
                                            QfDateFormatterStyle time) {
    return make_formatter(locale ? qf::retained(qf::checked(locale)) : qf_locale_create("C"), date,
                          time);
}

QfStringRef qf_date_formatter_copy_string(QfDateFormatterRef formatter, double seconds) {
    tm local{};
    qf::checked(formatter);
    return local_time(seconds, local) ? render(formatter, local) : nullptr;
}

}  // extern "C"
