#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

#include "ironmoat/errors.h"
#include "ironmoat/values.h"
#include "values/block_builder.h"

/// What crosses the trust line, byte for byte: doc/frames.md describes it.
namespace ironmoat::frames {

inline constexpr std::uint16_t kVersion = 1;
inline constexpr std::size_t kLengthBytes = 4;
/// The longest body of a request: id, a name of up to 255 bytes with its length, a message.
extern const std::size_t kMaxRequestBody;
/// The longest that a request frame has before its message, length included.
inline constexpr std::size_t kMaxRequestHead = kLengthBytes + 8 + 1 + 255;
extern const std::size_t kMaxReplyBody;

/// A frame breaks the rules of doc/frames.md. Nothing after it on the connection can be trusted.
class FrameError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// The service's first frame.
struct Hello {
  std::uint16_t version = kVersion;
  std::uint32_t confinement = 0;  ///< bits of frames::Confinement
  std::uint64_t messageBytes = 0;
  std::uint64_t recordBytes = 0;
  std::uint64_t deliveredBytes = 0;
  std::uint64_t replyBytes = 0;
  std::uint32_t nestedContainers = 0;

  /// This build's version and limits.
  static Hello ours();
  friend bool operator==(const Hello&, const Hello&) = default;
};

struct Request {
  std::uint64_t id = 0;
  std::string_view outputType;  ///< points into the frame's body
  Data message;
};

enum class Status : std::uint8_t {
  record = 0,     ///< the body is the encoded record
  refused = 1,    ///< a DecodingError
  notServed = 2,  ///< unknown output type or a bad request; the body is a sentence
  failed = 3,     ///< the service failed in another way; the body is a sentence
};

struct Reply {
  std::uint64_t id = 0;
  Status status = Status::failed;
  Data body;
};

/// Each appends one whole frame, length included, or leaves `out` as it was and throws: FrameError
/// for what no frame can hold, std::bad_alloc. Of a path or sentence as much is written as a frame
/// can carry.
void appendHello(BlockBuilder& out, const Hello& hello);
void appendRequest(BlockBuilder& out, std::uint64_t id, std::string_view outputType,
                   std::string_view message);
/// Everything of a request frame that stands before the message, for senders that write the
/// message's bytes from where they are.
void appendRequestHead(BlockBuilder& out, std::uint64_t id, std::string_view outputType,
                       std::size_t messageBytes);
/// How many bytes that is.
[[nodiscard]] std::size_t requestHeadBytes(std::string_view outputType) noexcept;
void appendRefusal(BlockBuilder& out, std::uint64_t id, const DecodingError& error);
void appendSentence(BlockBuilder& out, std::uint64_t id, Status status, std::string_view sentence);

/// A reply whose body is appended between `begin` and `end`. `begin` returns the frame's start in
/// `out`, which `end` takes; to give the reply up, truncate `out` to it. `end` does that itself
/// before it throws FrameError over a reply that is too long.
std::size_t beginReply(BlockBuilder& out, std::uint64_t id, Status status);
void endReply(BlockBuilder& out, std::size_t start);

/// Each takes the body of one frame (what follows its length) and throws FrameError when it is not
/// exactly as described. Views point into `body`, slices hold its block.
Hello parseHello(const Data& body);
Request parseRequest(const Data& body);
Reply parseReply(const Data& body);
/// The error inside a reply of status `refused`.
DecodingError parseRefusal(const Data& body);
/// The text inside a reply of status `notServed` or `failed`.
std::string parseSentence(const Data& body);

/// The id of a request whose rest may be broken; nothing when not even that is there.
std::optional<std::uint64_t> requestId(const Data& body) noexcept;

}  // namespace ironmoat::frames
