#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

#include "ironmoat/errors.h"
#include "ironmoat/fields.h"
#include "ironmoat/limits.h"
#include "ironmoat/values.h"
#include "values/block_builder.h"

/// The frames between a client and a service; doc/protocol.md specifies every byte.
namespace ironmoat::frames {

inline constexpr std::uint16_t kVersion = 1;
inline constexpr std::size_t kLengthBytes = 4;
inline constexpr std::size_t kMaxName = 255;  // bytes of an output type's name
/// Bytes of a request frame before its message, length included.
inline constexpr std::size_t kMaxRequestHead = kLengthBytes + 8 + 1 + kMaxName;
inline constexpr std::size_t kMaxRequestBody =
    kMaxRequestHead - kLengthBytes + limits::messageBytes;
inline constexpr std::size_t kMaxReplyBody = 8 + 1 + limits::replyBytes;

/// A frame violates the protocol. Nothing after it on the connection can be trusted.
class FrameError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// The service's first frame: its sandbox and its limits, by default those of this build.
struct Hello {
  std::uint32_t sandbox = 0;  ///< bits of sandbox::Part
  std::uint64_t messageBytes = limits::messageBytes;
  std::uint64_t recordBytes = limits::recordBytes;
  std::uint64_t deliveredBytes = limits::deliveredBytes;
  std::uint64_t replyBytes = limits::replyBytes;
  std::uint32_t nestedContainers = limits::nestedContainers;

  static Hello ours() { return {}; }
  friend bool operator==(const Hello&, const Hello&) = default;

  using H = Hello;
  using Fields = FieldList<H, &H::sandbox, &H::messageBytes, &H::recordBytes, &H::deliveredBytes,
                           &H::replyBytes, &H::nestedContainers>;
};

struct Request {
  std::uint64_t id = 0;
  std::string_view outputType;  ///< points into the frame's body
  Data message;
};

enum class Status : std::uint8_t {
  record = 0,     ///< the body is the encoded record
  rejected = 1,   ///< a DecodingError
  notServed = 2,  ///< unknown output type, or a bad request; the body is a description
  failed = 3,     ///< the service failed in another way; the body is a description
};

struct Reply {
  std::uint64_t id = 0;
  Status status = Status::failed;
  Data body;
};

// Each `append` function appends one whole frame, length included, or throws and leaves `out` as it
// was: FrameError if no frame can hold the arguments, std::bad_alloc. Paths and descriptions are
// truncated to what a frame can carry.

void appendHello(BlockBuilder& out, const Hello& hello);
/// The part of a request frame before its message, which the caller sends from where it is.
void appendRequestHead(BlockBuilder& out, std::uint64_t id, std::string_view outputType,
                       std::size_t messageBytes);
/// Bytes of that part.
[[nodiscard]] inline std::size_t requestHeadBytes(std::string_view outputType) noexcept {
  return kMaxRequestHead - kMaxName + outputType.size();
}
void appendRejection(BlockBuilder& out, std::uint64_t id, const DecodingError& error);
void appendDescription(BlockBuilder& out, std::uint64_t id, Status status,
                       std::string_view description);

/// The caller appends the body of a reply between the two. `begin` returns the start of the frame
/// in `out`, to which the caller truncates it to give the reply up. `end` does not check the
/// length: encodeRecord() bounds what it appends, and the receiver rejects a longer frame.
std::size_t beginReply(BlockBuilder& out, std::uint64_t id, Status status);
void endReply(BlockBuilder& out, std::size_t start) noexcept;

// Each `parse` function takes the body of one frame, without its length, and throws FrameError if
// the body is not exactly as specified. Views point into `body`; slices share its block.

Hello parseHello(const Data& body);
Request parseRequest(const Data& body);
Reply parseReply(const Data& body);
/// The error inside a reply of status `rejected`.
DecodingError parseRejection(const Data& body);
/// The text inside a reply of status `notServed` or `failed`.
std::string parseDescription(const Data& body);

/// The id of a request that may be invalid; none if the body is too short for one.
std::optional<std::uint64_t> requestId(const Data& body) noexcept;

}  // namespace ironmoat::frames
