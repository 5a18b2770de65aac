#pragma once

// How the whole machine was doing, for a person to read.

#include <string>

namespace tal {

/// Load, memory, pressure, the processes in a line each, and the nodes of PipeWire
/// where its tool is there and answers. Runs that tool and waits for it, half a
/// second at most.
std::string systemReport();

/// How the processors were shared out: pressure, frequencies, limits, statistics,
/// and the threads that were running, waiting for the disk or in real time.
std::string schedulerReport();

/// The kernel's trace buffer as text, its newest end where it is long; empty where
/// tracefs cannot be read.
std::string traceBuffer();

}  // namespace tal
