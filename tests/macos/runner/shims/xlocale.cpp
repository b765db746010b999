// Functions with a locale of their own. A null locale stands for "C".

#include <langinfo.h>
#include <locale.h>

#include <array>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <cwchar>

#include "tests/macos/runner/Shims.h"

namespace {

locale_t cLocale() {
  static const locale_t locale = newlocale(LC_ALL_MASK, "C", nullptr);
  return locale;
}

// Makes a locale the calling thread's own one.
class Use {
 public:
  explicit Use(locale_t locale) : before_(uselocale(locale == nullptr ? cLocale() : locale)) {}
  ~Use() { uselocale(before_); }
  Use(const Use&) = delete;
  Use& operator=(const Use&) = delete;

 private:
  locale_t before_;
};

// The function `Function` with one argument more, the locale.
template <auto Function>
struct In {
  template <class Result, class... Arguments>
  static constexpr auto make(Result (*)(Arguments...)) {
    return +[](Arguments... arguments, locale_t locale) -> Result {
      const Use use(locale);
      return convertingErrno([&] { return Function(arguments...); });
    };
  }
};

template <auto Function>
inline constexpr auto inLocale = In<Function>::make(Function);

struct Category {
  int darwin;
  int linux;
};

locale_t newLocale(int mask, const char* name, locale_t base) {
  static constexpr Category kMasks[] = {{1, LC_COLLATE_MASK},  {2, LC_CTYPE_MASK},    {4, LC_MESSAGES_MASK},
                                        {8, LC_MONETARY_MASK}, {16, LC_NUMERIC_MASK}, {32, LC_TIME_MASK}};
  int linux = 0;
  for (const Category& each : kMasks) {
    if ((mask & each.darwin) != 0) linux |= each.linux;
  }
  return converted(newlocale(linux, name, base));
}

void freeLocale(locale_t locale) {
  if (locale != nullptr) freelocale(locale);
}

char* setLocale(int category, const char* name) {
  static constexpr std::array kCategories = {LC_ALL,     LC_COLLATE, LC_CTYPE,   LC_MONETARY,
                                             LC_NUMERIC, LC_TIME,    LC_MESSAGES};
  return setlocale(kCategories.at(static_cast<std::size_t>(category)), name);
}

// The last six members are in another order.
lconv* reordered(const lconv* from) {
  static thread_local lconv result;
  result = *from;
  const std::array ordered = {from->int_p_cs_precedes,  from->int_n_cs_precedes, from->int_p_sep_by_space,
                              from->int_n_sep_by_space, from->int_p_sign_posn,   from->int_n_sign_posn};
  std::memcpy(&result.int_p_cs_precedes, ordered.data(), ordered.size());
  return &result;
}

lconv* conventions() {
  return reordered(localeconv());
}

lconv* conventionsIn(locale_t locale) {
  const Use use(locale);
  return reordered(localeconv());
}

[[gnu::format(printf, 4, 5)]] int printIn(char* buffer, std::size_t size, locale_t locale, const char* format,
                                          ...) {
  const Use use(locale);
  std::va_list arguments;
  va_start(arguments, format);
  const int result = std::vsnprintf(buffer, size, format, arguments);
  va_end(arguments);
  return result;
}

[[gnu::format(printf, 3, 4)]] int printNewIn(char** buffer, locale_t locale, const char* format, ...) {
  const Use use(locale);
  std::va_list arguments;
  va_start(arguments, format);
  const int result = vasprintf(buffer, format, arguments);
  va_end(arguments);
  return result;
}

[[gnu::format(scanf, 3, 4)]] int scanIn(const char* text, locale_t locale, const char* format, ...) {
  const Use use(locale);
  std::va_list arguments;
  va_start(arguments, format);
  const int result = std::vsscanf(text, format, arguments);
  va_end(arguments);
  return result;
}

std::size_t formatTime(char* buffer, std::size_t size, const char* format, const tm* time, locale_t locale) {
  return strftime_l(buffer, size, format, time, locale == nullptr ? cLocale() : locale);
}

int longestCharacter(locale_t locale) {
  const Use use(locale);
  return static_cast<int>(MB_CUR_MAX);
}

}  // namespace

shims::Table shims::xlocale() {
  static const Shim table[] = {
      shim("___mb_cur_max_l", &longestCharacter),
      shim("asprintf_l", &printNewIn),
      shim("btowc_l", inLocale<&::btowc>),
      shim("freelocale", &freeLocale),
      shim("localeconv", &conventions),
      shim("localeconv_l", &conventionsIn),
      shim("mbrlen_l", inLocale<&::mbrlen>),
      shim("mbrtowc_l", inLocale<&::mbrtowc>),
      shim("mbsnrtowcs_l", inLocale<&::mbsnrtowcs>),
      shim("mbsrtowcs_l", inLocale<&::mbsrtowcs>),
      shim("mbtowc_l", inLocale<&::mbtowc>),
      shim("newlocale", &newLocale),
      shim("setlocale", &setLocale),
      shim("snprintf_l", &printIn),
      shim("sscanf_l", &scanIn),
      shim("strcoll_l", inLocale<&::strcoll>),
      shim("strftime_l", &formatTime),
      shim("strtod_l", inLocale<&::strtod>),
      shim("strtof_l", inLocale<&::strtof>),
      shim("strtold_l", inLocale<&::strtold>),
      shim("strtoll_l", inLocale<&::strtoll>),
      shim("strtoull_l", inLocale<&::strtoull>),
      shim("strxfrm_l", inLocale<&::strxfrm>),
      shim("uselocale", &::uselocale),
      shim("wcrtomb_l", inLocale<&::wcrtomb>),
      shim("wcscoll_l", inLocale<&::wcscoll>),
      shim("wcsnrtombs_l", inLocale<&::wcsnrtombs>),
      shim("wcsxfrm_l", inLocale<&::wcsxfrm>),
      shim("wctob_l", inLocale<&::wctob>),
  };
  return table;
}
