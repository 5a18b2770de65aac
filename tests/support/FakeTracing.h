#pragma once

// Performance tracing, driven by hand: what the tracer tells happens while the
// worker waits, so that every road takes no time.

#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/TracingPlatform.h"

namespace tal::test {

/// A wait that finds no signal runs what was planned for it; without that signal
/// too, it lets its whole time pass.
class HandSemaphore final : public CountingSemaphore {
 public:
  struct Plan {
    std::vector<std::function<void()>> during_waits;
    std::vector<std::chrono::nanoseconds> waited;  // all but the waits for no time
  };

  explicit HandSemaphore(Plan& plan) : plan_(plan) {}
  void signal() override { ++count_; }
  bool wait(std::chrono::nanoseconds timeout) override {
    if (timeout.count() > 0) plan_.waited.push_back(timeout);
    if (count_ == 0 && timeout.count() > 0 && !plan_.during_waits.empty()) {
      const auto happens = std::move(plan_.during_waits.front());
      plan_.during_waits.erase(plan_.during_waits.begin());
      happens();
    }
    if (count_ == 0) return false;
    --count_;
    return true;
  }

 private:
  Plan& plan_;
  int count_ = 0;
};

/// Records what is asked; the test tells the delegate what it likes.
class FakePerftrail final : public PerftrailService {
 public:
  struct State {
    std::vector<std::string> calls;
    std::weak_ptr<PerftrailDelegate> delegate;
    bool valid = true;
  };

  std::unique_ptr<PerftrailConfiguration> makeConfiguration(
      PerftrailConfiguration::Template trace_template) override {
    return std::make_unique<PerftrailConfiguration>(PerftrailConfiguration{.trace_template = trace_template});
  }
  std::shared_ptr<PerftrailSession> makeSession(const PerftrailConfiguration& configuration) override {
    state->calls.push_back("make " + std::to_string(static_cast<int>(configuration.trace_template)) +
                           (configuration.compression ? " compressed" : ""));
    return std::make_shared<Session>(state);
  }
  std::shared_ptr<PerftrailDelegate> delegate() const { return state->delegate.lock(); }

  const std::shared_ptr<State> state = std::make_shared<State>();

 private:
  class Session final : public PerftrailSession {
   public:
    explicit Session(std::shared_ptr<State> state) : state_(std::move(state)) {}
    ~Session() override { state_->calls.emplace_back("gone"); }
    void setDelegate(std::weak_ptr<PerftrailDelegate> delegate) override {
      state_->delegate = std::move(delegate);
    }
    void start() override { state_->calls.emplace_back("start"); }
    void stop() override { state_->calls.emplace_back("stop"); }
    bool isValid() const override { return state_->valid; }

   private:
    const std::shared_ptr<State> state_;
  };
};

/// Trace models with the content that the test gives them.
class FakeSkein final : public SkeinLibrary,
                        SkeinTraceModelClass,
                        SkeinSignpostModelClass,
                        SkeinProbeFactoryClass {
 public:
  SkeinTraceModelClass* traceModelClass() override { return lookUp("trace") ? this : nullptr; }
  SkeinSignpostModelClass* signpostModelClass() override { return lookUp("signpost") ? this : nullptr; }
  SkeinProbeFactoryClass* probeFactoryClass() override { return lookUp("probes") ? this : nullptr; }
  void acknowledge() override { calls.emplace_back("acknowledge"); }

  bool absent = false;
  std::string trace_error;
  std::string signposts_error;
  std::uint64_t discarded = 0;
  std::vector<SkeinSignpost> signposts;
  std::map<std::string, std::vector<SkeinProbe::Series>> series;  // by the probe's name
  std::vector<std::string> calls;
  std::vector<SkeinProbeDescription> asked;

 private:
  struct Trace final : SkeinTraceModel {
    explicit Trace(std::uint64_t lost) : discarded(lost) {}
    std::uint64_t eventCount() const override { return 1; }
    std::uint64_t discardedEventCount() const override { return discarded; }
    std::uint64_t discarded;
  };
  struct Signposts final : SkeinSignpostModel {
    explicit Signposts(std::vector<SkeinSignpost> all) : list(std::move(all)) {}
    const std::vector<SkeinSignpost>& signposts() const override { return list; }
    std::uint64_t unpairedCount() const override { return 0; }
    std::vector<SkeinSignpost> list;
  };
  struct Probe final : SkeinProbe {
    const SkeinProbeDescription& description() const override { return what; }
    const std::vector<Series>& series() const override { return list; }
    std::string_view shortcoming() const override { return list.empty() ? "nothing to measure" : ""; }
    SkeinProbeDescription what;
    std::vector<Series> list;
  };

  bool lookUp(const char* name) {
    calls.emplace_back(std::string("look up ") + name);
    return !absent;
  }
  SkeinResult<SkeinTraceModel> modelWithTrace(const std::string& trace_url) override {
    calls.push_back("open " + trace_url);
    if (!trace_error.empty()) return {nullptr, trace_error};
    return {std::make_unique<Trace>(discarded), ""};
  }
  SkeinResult<SkeinSignpostModel> modelWithTraceModel(const SkeinTraceModel&) override {
    if (!signposts_error.empty()) return {nullptr, signposts_error};
    return {std::make_unique<Signposts>(signposts), ""};
  }
  std::vector<std::unique_ptr<SkeinProbe>> probesWithDescriptions(
      const std::vector<SkeinProbeDescription>& descriptions, const SkeinTraceModel&) override {
    asked = descriptions;
    std::vector<std::unique_ptr<SkeinProbe>> probes;
    for (const auto& description : descriptions) {
      auto probe = std::make_unique<Probe>();
      probe->what = description;
      probe->list = series[description.name];
      probes.push_back(std::move(probe));
    }
    return probes;
  }
};

/// Keeps what is written: metrics in `metrics`, and the roads of files in `calls`.
class FakeResults final : public PerfDataWriters, public ClientFiles {
 public:
  // Files of clients.
  Contents read(const ClientIdentity*, std::string_view path, std::size_t) override {
    const auto found = files.find(std::string(path));
    if (found == files.end()) return {std::nullopt, "there is none"};
    return {found->second, ""};
  }
  OpenedDirectory openDirectory(const ClientIdentity*, std::string_view path) override {
    calls.push_back("directory " + std::string(path));
    if (directory_error) return {nullptr, *directory_error};
    return {std::make_unique<Directory>(*this), ""};
  }
  OpenedDirectory openDiagnosticDirectory(std::string_view place) override {
    return openDirectory(nullptr, place);
  }
  // Performance data.
  std::unique_ptr<PerfDataWriter> makeWriter(ResultsDirectory&, std::string file_name, int version,
                                             std::string name) override {
    calls.push_back("writer " + file_name + " " + std::to_string(version) + " " + name);
    return std::make_unique<Writer>(*this);
  }

  const PerfMetric& metric(std::string_view name) const {
    for (const PerfMetric& each : metrics) {
      if (each.name == name) return each;
    }
    static const PerfMetric none{};
    return none;
  }

  std::map<std::string, std::string> files;
  std::optional<std::string> directory_error;
  std::optional<std::string> write_error;
  std::optional<std::string> move_error;
  std::vector<std::string> calls;
  std::vector<PerfMetric> metrics;
  MessageDict variables;
  double total_time = 0;

 private:
  struct Directory final : ResultsDirectory {
    explicit Directory(FakeResults& owner) : results(owner) {}
    DiagnosticLog::Opened createFile(std::string_view) override { return {}; }
    Error move(std::string_view from, std::string_view to) override {
      results.calls.push_back("move " + std::string(from) + " " + std::string(to));
      return results.move_error;
    }
    FakeResults& results;
  };
  struct Writer final : PerfDataWriter {
    explicit Writer(FakeResults& owner) : results(owner) {}
    void addKeyVariables(const MessageDict& added) override { results.variables.merge(added); }
    void addMetric(PerfMetric metric) override { results.metrics.push_back(std::move(metric)); }
    void setTotalTime(double milliseconds, const std::vector<std::string>&) override {
      results.total_time = milliseconds;
    }
    ResultsDirectory::Error write() override {
      results.calls.emplace_back("write");
      return results.write_error;
    }
    FakeResults& results;
  };
};

/// Lists that the test made, by their "XML".
class FakePropertyLists final : public PropertyLists {
 public:
  Result valueFromXml(std::string_view xml) const override {
    const auto found = values.find(std::string(xml));
    if (found == values.end()) return {std::nullopt, "no XML property list"};
    return {found->second, ""};
  }
  std::map<std::string, MessageValue> values;
};

struct FakeTracing {
  FakePerftrail perftrail;
  FakeSkein skein;
  FakeResults results;
  FakePropertyLists lists;
  HandSemaphore::Plan waits;
  TracingPlatform platform{.perftrail = perftrail,
                           .skein = skein,
                           .perf_data = results,
                           .client_files = results,
                           .property_lists = lists,
                           .make_semaphore = [this] { return std::make_unique<HandSemaphore>(waits); }};
};

}  // namespace tal::test
