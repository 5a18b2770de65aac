#include "platform/linux/tracing/LinuxPerftrailService.h"

#include <atomic>
#include <mutex>
#include <utility>

#include "platform/linux/tracing/HelperProcess.h"
#include "platform/linux/tracing/TraceDirectories.h"
#include "platform/linux/tracing/TraceHelper.h"

namespace tal {

namespace {

constexpr std::string_view kTracesPlace = "Audio/Traces";

}  // namespace

/// One recording, held by its session and by the thread that listens to the
/// helper: whoever is last.
class PerftrailRun {
 public:
  void setDelegate(std::weak_ptr<PerftrailDelegate> delegate) {
    const std::lock_guard lock(mutex_);
    delegate_ = std::move(delegate);
  }
  std::shared_ptr<PerftrailDelegate> delegate() const {
    const std::lock_guard lock(mutex_);
    return delegate_.lock();
  }

  bool isValid() const { return valid_; }
  bool hasEnded() const { return ended_; }
  void stop() { helper_.writeLine(kHelperStop); }
  void giveUp() { helper_.giveUp(); }

  /// On the thread of this recording.
  void record(const std::filesystem::path& program, const std::vector<std::string>& arguments,
              std::string error) {
    if (error.empty()) error = helper_.spawn(program, arguments);
    if (error.empty()) {
      helper_.readLines([this](std::string_view line) { take(line); });
      if (valid_) finish("", "the tracer's helper program ended early");
    } else {
      failStart(error);
    }
    ended_ = true;
  }

 private:
  void take(std::string_view line) {
    const auto blank = line.find(' ');
    const std::string_view word = line.substr(0, blank);
    const std::string text(blank == std::string_view::npos ? "" : line.substr(blank + 1));
    const auto told = delegate();
    if (word == kHelperStarted) {
      started_ = true;
      if (told) told->perftrailDidStart(std::nullopt);
    } else if (word == kHelperStartFailed) {
      failStart(text);
    } else if (word == kHelperStopped) {
      if (told) told->perftrailDidStop(std::nullopt);
    } else if (word == kHelperComplete) {
      finish(text, std::nullopt);
    } else if (word == kHelperFailed) {
      finish("", text);
    }
  }

  void failStart(const std::string& error) {
    valid_ = false;
    if (const auto told = delegate()) told->perftrailDidStart(error);
  }

  void finish(const std::string& trace_url, const PerftrailDelegate::Error& error) {
    if (!started_) return failStart(error.value_or("the recording ended before it began"));
    valid_ = false;
    if (const auto told = delegate()) told->perftrailDidComplete(trace_url, "lttng", error);
  }

  mutable std::mutex mutex_;
  std::weak_ptr<PerftrailDelegate> delegate_;
  HelperProcess helper_;
  bool started_ = false;  // the recording's thread alone
  std::atomic<bool> valid_{true};
  std::atomic<bool> ended_{false};
};

class LinuxPerftrailService::Session final : public PerftrailSession {
 public:
  Session(LinuxPerftrailService& service, PerftrailConfiguration::Template trace_template)
      : service_(service), template_(trace_template), run_(std::make_shared<PerftrailRun>()) {}
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;
  ~Session() override { run_->giveUp(); }

  void setDelegate(std::weak_ptr<PerftrailDelegate> delegate) override {
    run_->setDelegate(std::move(delegate));
  }
  void start() override { service_.run(run_, template_); }
  void stop() override { run_->stop(); }
  bool isValid() const override { return run_->isValid(); }

 private:
  LinuxPerftrailService& service_;
  const PerftrailConfiguration::Template template_;
  const std::shared_ptr<PerftrailRun> run_;
};

LinuxPerftrailService::LinuxPerftrailService(Options options) : options_(std::move(options)) {}

LinuxPerftrailService::~LinuxPerftrailService() {
  for (const Running& running : running_) running.run->giveUp();
  for (Running& running : running_) running.thread.join();
}

std::unique_ptr<PerftrailConfiguration> LinuxPerftrailService::makeConfiguration(
    PerftrailConfiguration::Template trace_template) {
  return std::make_unique<PerftrailConfiguration>(PerftrailConfiguration{.trace_template = trace_template});
}

std::shared_ptr<PerftrailSession> LinuxPerftrailService::makeSession(
    const PerftrailConfiguration& configuration) {
  joinEnded();
  return std::make_shared<Session>(*this, configuration.trace_template);
}

void LinuxPerftrailService::joinEnded() {
  std::erase_if(running_, [](Running& running) {
    if (!running.run->hasEnded()) return false;
    running.thread.join();
    return true;
  });
}

void LinuxPerftrailService::run(std::shared_ptr<PerftrailRun> run,
                                PerftrailConfiguration::Template trace_template) {
  TraceDirectory directory;
  if (auto error = options_.diagnostic_log.makeDirectory(kTracesPlace)) {
    directory.error = std::move(*error);
  } else {
    directory = makeTraceDirectory(options_.diagnostic_log.pathOf(kTracesPlace),
                                   options_.clock.localTimeForFileName());
  }
  std::vector<std::string> arguments{std::to_string(static_cast<int>(trace_template)),
                                     directory.path.string(), options_.home.string()};
  std::thread thread([run, program = options_.helper, arguments = std::move(arguments),
                      error = std::move(directory.error)] { run->record(program, arguments, error); });
  running_.push_back({std::move(run), std::move(thread)});
}

}  // namespace tal
