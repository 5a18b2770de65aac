#pragma once

#include <cstdint>

namespace tal {

/// How far the store has got with the rows that were handed to it: for those who
/// must not acknowledge a message before its rows are safe, and who must stop
/// taking messages in while the store cannot follow.
///
/// Rows are numbered from 1 in the order in which they are handed over, whatever
/// their table. They are settled in that order too: each is committed or, in
/// need, given up.
class DurabilityGate {
 public:
  /// Told on the store's own thread, with no lock of the store held. Must be
  /// cheap and must not call back.
  class Listener {
   public:
    virtual ~Listener() = default;

    /// All rows up to number `up_to` are settled.
    virtual void rowsSettled(std::uint64_t up_to) = 0;

    /// `backlogIsOverBound` has just become false.
    virtual void backlogRelieved() = 0;
  };

  virtual ~DurabilityGate() = default;

  /// The number of the row handed over last, 0 before the first. What the calling
  /// thread handed over before is counted.
  virtual std::uint64_t lastRow() const = 0;

  /// True when one of these settled rows, both ends included, is not on the disk
  /// and never will be. Any thread.
  virtual bool wasGivenUp(std::uint64_t first_row, std::uint64_t last_row) const = 0;

  /// Somebody waits for the rows handed over so far: commit them at once. Any thread.
  virtual void commitSoon() = 0;

  /// True while more rows wait than the store's bound allows. Any thread; asked
  /// before each read from a socket.
  virtual bool backlogIsOverBound() const = 0;

  /// One listener; null takes it away, and no call to it is under way any more
  /// when this returns. Not on the store's own thread.
  virtual void setListener(Listener* listener) = 0;
};

}  // namespace tal
