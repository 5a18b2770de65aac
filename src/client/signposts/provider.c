/*
 * The library that libtalreporting loads when signposts are to be recorded. It is apart from it because the
 * tracer starts threads in every program that it is loaded into.
 */
#define LTTNG_UST_TRACEPOINT_CREATE_PROBES
#define LTTNG_UST_TRACEPOINT_DEFINE
#include "signpost_events.h"

__attribute__((visibility("default"))) void talreporting_provider_begin(const char* subsystem,
                                                                        const char* name);
__attribute__((visibility("default"))) void talreporting_provider_end(const char* subsystem,
                                                                      const char* name);

void talreporting_provider_begin(const char* subsystem, const char* name) {
  if (subsystem && name) lttng_ust_tracepoint(talreporting, signpost_begin, subsystem, name);
}

void talreporting_provider_end(const char* subsystem, const char* name) {
  if (subsystem && name) lttng_ust_tracepoint(talreporting, signpost_end, subsystem, name);
}
