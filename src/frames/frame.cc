#include "frames/frame.h"

#include <cstring>

#include "frames/little_endian.h"
#include "values/utf8.h"

namespace ironmoat::frames {

namespace {

constexpr std::string_view kMagic = "IRONMOAT";
constexpr std::size_t kMaxText = 65535;
constexpr std::uint64_t kNoOffset = ~std::uint64_t{0};
static_assert(kMaxRequestBody <= UINT32_MAX && kMaxReplyBody <= UINT32_MAX);
static_assert(Hello::Fields::check());

/// The part of `text` that a frame can carry: at most kMaxText bytes of valid UTF-8 before the
/// first zero byte, at which std::exception::what() would end.
std::string_view carried(std::string_view text) noexcept {
  text = text.substr(0, kMaxText);
  text = text.substr(0, text.find('\0'));
  return text.substr(0, validUtf8Prefix(text));
}

// A part of a frame is text, or a number or enumerator of its own size.
std::size_t bytesOf(std::string_view text) noexcept { return text.size(); }
template <Fixed T>
constexpr std::size_t bytesOf(T) noexcept {
  return sizeof(T);
}
char* put(char* to, std::string_view text) noexcept {
  if (!text.empty()) std::memcpy(to, text.data(), text.size());
  return to + text.size();
}
template <Fixed T>
char* put(char* to, T number) noexcept {
  return store(to, number);
}

/// Appends a frame of `parts`, whose body has `further` bytes that the caller appends. Allocates
/// once, so that `out` is unchanged when there is no memory.
template <class... Parts>
void appendFrame(BlockBuilder& out, std::size_t further, const Parts&... parts) {
  const std::size_t size = (bytesOf(parts) + ...);
  char* at = store(out.extend(kLengthBytes + size), static_cast<std::uint32_t>(size + further));
  ((at = put(at, parts)), ...);
}

[[noreturn, gnu::cold, gnu::noinline]] void rejectNumber(const char* name, unsigned found) {
  throw FrameError(std::string("not a valid ") + name + ": " + std::to_string(found));
}

/// Takes a body apart from front to back.
class Parser {
 public:
  explicit Parser(const Data& body) noexcept : body_(body), left_(body.view()) {}

  template <std::integral T>
  T number() {
    return load<T>(text(sizeof(T)).data());
  }

  /// An enumerator from 0 to `last`.
  template <class E>
  E enumerator(E last, const char* name) {
    const auto value = number<std::underlying_type_t<E>>();
    if (value > static_cast<std::underlying_type_t<E>>(last)) rejectNumber(name, value);
    return static_cast<E>(value);
  }

  std::string_view text(std::size_t length) {
    if (length > left_.size()) throw FrameError("unexpected end of frame");
    const std::string_view taken = left_.substr(0, length);
    left_.remove_prefix(length);
    return taken;
  }

  [[nodiscard]] std::string description(std::size_t length) {
    const std::string_view taken = text(length);
    if (carried(taken).size() != length) throw FrameError("not a valid text in a frame");
    return std::string(taken);
  }

  [[nodiscard]] std::size_t left() const noexcept { return left_.size(); }

  [[nodiscard]] Data rest() const noexcept {
    const detail::Slice& whole = body_.slice();
    const auto length = static_cast<std::uint32_t>(left_.size());
    return Data(detail::Slice(whole.block(), whole.offset() + whole.length() - length, length));
  }

 private:
  const Data& body_;
  std::string_view left_;
};

}  // namespace

void appendHello(BlockBuilder& out, const Hello& hello) {
  [&]<auto... Members>(FieldList<Hello, Members...>) {
    appendFrame(out, 0, kMagic, kVersion, hello.*Members...);
  }
  (Hello::Fields());
}

Hello parseHello(const Data& body) {
  Parser parser(body);
  if (parser.text(kMagic.size()) != kMagic) throw FrameError("not a valid hello");
  const auto version = parser.number<std::uint16_t>();
  if (version != kVersion) rejectNumber("protocol version", version);
  Hello hello;
  Hello::Fields::forEach([&](auto field) {
    using F = decltype(field);
    F::in(hello) = parser.number<typename F::Type>();
  });
  if (parser.left() != 0) throw FrameError("unexpected bytes after the hello");
  return hello;
}

void appendRequestHead(BlockBuilder& out, std::uint64_t id, std::string_view outputType,
                       std::size_t messageBytes) {
  if (outputType.empty() || outputType.size() > kMaxName) {
    throw FrameError("not a valid output type: expected 1 to 255 bytes");
  }
  const std::size_t head = requestHeadBytes(outputType) - kLengthBytes;
  if (messageBytes > kMaxRequestBody - head) {
    throw FrameError("request exceeds the limit of " + std::to_string(kMaxRequestBody) + " bytes");
  }
  appendFrame(out, messageBytes, id, static_cast<std::uint8_t>(outputType.size()), outputType);
}

Request parseRequest(const Data& body) {
  Parser parser(body);
  Request request;
  request.id = parser.number<std::uint64_t>();
  request.outputType = parser.text(parser.number<std::uint8_t>());
  if (request.outputType.empty()) throw FrameError("missing output type");
  request.message = parser.rest();
  return request;
}

std::optional<std::uint64_t> requestId(const Data& body) noexcept {
  if (body.size() < sizeof(std::uint64_t)) return std::nullopt;
  return load<std::uint64_t>(body.view().data());
}

std::size_t beginReply(BlockBuilder& out, std::uint64_t id, Status status) {
  const std::size_t start = out.size();
  appendFrame(out, 0, id, status);
  return start;
}

void endReply(BlockBuilder& out, std::size_t start) noexcept {
  store(out.bytes() + start, static_cast<std::uint32_t>(out.size() - start - kLengthBytes));
}

void appendRejection(BlockBuilder& out, std::uint64_t id, const DecodingError& error) {
  const std::string_view path = carried(error.path());
  appendFrame(out, 0, id, Status::rejected, error.kind(), error.offset().value_or(kNoOffset),
              static_cast<std::uint16_t>(path.size()), path, carried(error.what()));
}

void appendDescription(BlockBuilder& out, std::uint64_t id, Status status,
                       std::string_view description) {
  appendFrame(out, 0, id, status, carried(description));
}

Reply parseReply(const Data& body) {
  Parser parser(body);
  Reply reply;
  reply.id = parser.number<std::uint64_t>();
  reply.status = parser.enumerator(Status::failed, "status");
  reply.body = parser.rest();
  return reply;
}

DecodingError parseRejection(const Data& body) {
  Parser parser(body);
  const auto kind = parser.enumerator(DecodingError::Kind::notEnoughMemory, "kind of rejection");
  const auto offset = parser.number<std::uint64_t>();
  std::string path = parser.description(parser.number<std::uint16_t>());
  return {kind, std::move(path), parser.description(parser.left()),
          offset == kNoOffset ? std::nullopt : std::optional(offset)};
}

std::string parseDescription(const Data& body) {
  Parser parser(body);
  return parser.description(parser.left());
}

}  // namespace ironmoat::frames
