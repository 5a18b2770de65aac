/* Stands in for the library with the trace points: writes down what it is told. */
#include <stdio.h>
#include <string.h>

static char told[256];

static void note(const char* what, const char* subsystem, const char* name) {
  const size_t used = strlen(told);
  snprintf(told + used, sizeof told - used, "%s %s %s\n", what, subsystem, name);
}

void talreporting_provider_begin(const char* subsystem, const char* name);
void talreporting_provider_end(const char* subsystem, const char* name);
const char* recording_provider_told(void);

void talreporting_provider_begin(const char* subsystem, const char* name) { note("begin", subsystem, name); }
void talreporting_provider_end(const char* subsystem, const char* name) { note("end", subsystem, name); }
const char* recording_provider_told(void) { return told; }
