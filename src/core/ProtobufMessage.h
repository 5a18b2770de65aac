#pragma once

// What all records in protocol-buffers encoding have in common.

#include <string>

#include "core/ProtobufReader.h"
#include "core/ProtobufWriter.h"

namespace tal {

/// A record in the standard protocol-buffers binary encoding. One thread at a time.
class ProtobufMessage {
 public:
  virtual ~ProtobufMessage() = default;

  /// Appends the encoded record.
  virtual void writeTo(ProtobufWriter& writer) const = 0;

  /// Appends the record as one JSON object, for people to read.
  virtual void formatText(std::string& out) const = 0;

  /// Takes over the fields that the encoded record holds; the others stay as they
  /// are. False when it is malformed; the fields before that are taken over.
  virtual bool readFrom(ProtobufReader& reader) = 0;

 protected:
  ProtobufMessage() = default;
  ProtobufMessage(const ProtobufMessage&) = default;
  ProtobufMessage(ProtobufMessage&&) = default;
  ProtobufMessage& operator=(const ProtobufMessage&) = default;
  ProtobufMessage& operator=(ProtobufMessage&&) = default;
};

}  // namespace tal
