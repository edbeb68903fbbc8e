#pragma once

#include "ironmoat/values.h"
#include "plist/document_builder.h"
#include "plist/rejection.h"
#include "plist/writer.h"

namespace ironmoat::plist {

template <class Keys>
class KeyedEncodingContainer;

/// The destination of one record's encoding, which opens one container in it.
class Encoder {
 public:
  explicit Encoder(DocumentBuilder& builder) noexcept : builder_(builder) {}

  /// Opens a dictionary as the current value. encodeValue() closes it.
  template <class Keys>
  [[nodiscard]] KeyedEncodingContainer<Keys> container() {
    if (!builder_.beginDictionary()) throw tooDeep();
    return KeyedEncodingContainer<Keys>(*this);
  }
  [[nodiscard]] DocumentBuilder& builder() noexcept { return builder_; }

 private:
  DocumentBuilder& builder_;
};

inline void encodeValue(Encoder& encoder, Int value) { encoder.builder().integer(value); }
inline void encodeValue(Encoder& encoder, Int64 value) { encoder.builder().integer(value); }
inline void encodeValue(Encoder& encoder, Bool value) { encoder.builder().boolean(value); }
inline void encodeValue(Encoder& encoder, const String& value) {
  encoder.builder().string(value.view());
}
inline void encodeValue(Encoder& encoder, const Data& value) {
  encoder.builder().data(value.view());
}
template <class R>
requires requires(const R& record, Encoder& encoder) { record.encode(encoder); }
void encodeValue(Encoder& encoder, const R& record) {
  record.encode(encoder);
  encoder.builder().end();
}
template <class T>
void encodeValue(Encoder& encoder, const List<T>& list) {
  if (!encoder.builder().beginArray()) throw tooDeep();
  for (const T& element : list) encodeValue(encoder, element);
  encoder.builder().end();
}

template <class Keys>
class KeyedEncodingContainer {
 public:
  explicit KeyedEncodingContainer(Encoder& encoder) noexcept : encoder_(encoder) {}

  template <class T>
  void encode(const T& value, Keys key) {
    encoder_.builder().string(key.stringValue());
    encodeValue(encoder_, value);
  }
  template <class Field>
  void encodeIfPresent(const Field& value, Keys key) {
    if (value) encode(*value, key);
  }

 private:
  Encoder& encoder_;
};

enum class Format { binary, xml };

/// Encodes a record as a property list by `R::encode(Encoder&)`.
class PropertyListEncoder {
 public:
  explicit PropertyListEncoder(Format format) noexcept : format_(format) {}

  /// Throws DecodingError `limitExceeded` for a record nested deeper than
  /// limits::nestedContainers, std::invalid_argument for text that XML cannot hold, and the
  /// exceptions of R's encoding.
  template <class R>
  [[nodiscard]] Data encode(const R& record) const {
    Document document;
    DocumentBuilder builder(document, BlockRef(), Sharing::anyThread);
    Encoder encoder(builder);
    encodeValue(encoder, record);
    builder.finish();
    return format_ == Format::binary ? writeBinary(document) : writeXml(document);
  }

 private:
  Format format_;
};

}  // namespace ironmoat::plist
