#pragma once

// The conversation with the helper program that drives the tracer.
//
// The helper is started as `tal-perftrail TEMPLATE TRACE-DIRECTORY HOME`, reads
// "stop" on its standard input, where an end of input means to give everything
// up, and writes lines on its standard output, each one of these words and
// perhaps a text behind a blank:
inline constexpr char kHelperStarted[] = "started";
inline constexpr char kHelperStartFailed[] = "start-failed";
inline constexpr char kHelperStopped[] = "stopped";
inline constexpr char kHelperComplete[] = "complete";
inline constexpr char kHelperFailed[] = "failed";
inline constexpr char kHelperStop[] = "stop";
