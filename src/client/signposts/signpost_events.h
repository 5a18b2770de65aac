/*
 * The trace points behind talreporting_signpost_begin() and _end(), as the tracer's macros want them: the
 * tracer includes this header several times over, which is why its guard lets it.
 */
#ifndef LTTNG_UST_TRACEPOINT_PROVIDER
#define LTTNG_UST_TRACEPOINT_PROVIDER talreporting
#endif

#ifndef LTTNG_UST_TRACEPOINT_INCLUDE
#define LTTNG_UST_TRACEPOINT_INCLUDE "./signpost_events.h"
#endif

#if !defined(TALREPORTING_SIGNPOST_EVENTS_H) || defined(LTTNG_UST_TRACEPOINT_HEADER_MULTI_READ)
#define TALREPORTING_SIGNPOST_EVENTS_H

#include <lttng/tracepoint.h>

/* clang-format off: these are no functions. */
LTTNG_UST_TRACEPOINT_EVENT_CLASS(talreporting, signpost,
                                 LTTNG_UST_TP_ARGS(const char*, subsystem, const char*, name),
                                 LTTNG_UST_TP_FIELDS(lttng_ust_field_string(subsystem, subsystem)
                                                         lttng_ust_field_string(name, name)))
LTTNG_UST_TRACEPOINT_EVENT_INSTANCE(talreporting, signpost, talreporting, signpost_begin,
                                    LTTNG_UST_TP_ARGS(const char*, subsystem, const char*, name))
LTTNG_UST_TRACEPOINT_EVENT_INSTANCE(talreporting, signpost, talreporting, signpost_end,
                                    LTTNG_UST_TP_ARGS(const char*, subsystem, const char*, name))
/* clang-format on */

#endif

#include <lttng/tracepoint-event.h>
