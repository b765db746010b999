// Literal formats that do not fit their arguments, one for each kind of mistake. Each macro selects several
// mistakes, since each compilation is slow. Within a group all mistakes differ, so each refusal is seen.
#include <string>

#include "Runtime/Text/Format.h"
#include "Runtime/Values/Number.h"

using namespace rt::literals;

const rt::Ref<rt::Number> number;
const long wide = 0;
const rt::String notLiteral = rt::String::fromUTF8("%d");

struct Undescribed {};

rt::String right[] = {
    rt::format("%@", std::string("text")),
    rt::format("%@ %d %ld %s %p %g %ls %*d", number, 1, wide, "text", nullptr, 1.5, L"wide", 3, 4),
    rt::format("%2$d %1$@"_s, number, 2),
};

rt::String wrong[] = {
#ifdef FORMAT
    rt::format("%@ %d", number),
    rt::format("%@", number, 1),
    rt::format("%y", 1),
    rt::format("%1$d %d", 1, 2),
    rt::format("%*d", wide, 1),
    rt::format("%n", &wide),
    rt::format("\xFF"),
#endif
#ifdef FORMAT_ELSEWISE
    rt::format("%2$d", 1, 2),
    rt::format("100%"),
    rt::format("%1$d %3$d", 1, 2),
    rt::format("%@"_s, 1),
    rt::format("%d"_s, 1.5),
    rt::format("%ld"_s, 1),
#endif
#ifdef TYPE
    rt::format("%@", "text"),
    rt::format("%d", number),
    rt::format("%d", wide),
    rt::format("%g", 1),
    rt::format("%Lg", 1.5),
    rt::format("%g", 1.5L),
    rt::format("%s", std::string("text")),
    rt::format("%ls", "text"),
    rt::format("%p", 1),
#endif
#ifdef NO_ARGUMENT
    rt::format("%@", Undescribed()),
#endif
#ifdef NO_LITERAL
    rt::format(notLiteral, 1),
#endif
#ifdef LITERAL
    "\xFF"_s,
#endif
    nullptr,
};
