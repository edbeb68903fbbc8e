#include "frames/frame.h"

#include <cstring>

#include "frames/little_endian.h"
#include "ironmoat/limits.h"
#include "values/utf8.h"

namespace ironmoat::frames {

namespace {

constexpr std::string_view kMagic = "IRONMOAT";
constexpr std::size_t kHelloBody = kMagic.size() + 2 + 4 + 8 + 8 + 8 + 8 + 4;
constexpr std::size_t kRequestHead = 8 + 1;  // and the name
constexpr std::size_t kMaxName = kMaxRequestHead - kLengthBytes - kRequestHead;
static_assert(kMaxName == 255);
constexpr std::size_t kReplyHead = 8 + 1;
constexpr std::size_t kRefusalHead = 1 + 8 + 2;
constexpr std::size_t kMaxText = 65535;
constexpr std::uint64_t kNoOffset = ~std::uint64_t{0};

constexpr std::size_t kLongestRequest = kRequestHead + kMaxName + limits::messageBytes;
constexpr std::size_t kLongestReply = kReplyHead + limits::replyBytes;
static_assert(kLongestRequest <= UINT32_MAX && kLongestReply <= UINT32_MAX);

char* storeText(char* to, std::string_view text) noexcept {
  if (!text.empty()) std::memcpy(to, text.data(), text.size());
  return to + text.size();
}

/// What of `text` a frame can carry: valid UTF-8 of at most kMaxText bytes, none of them zero, at
/// which std::exception::what() would end.
std::string_view carried(std::string_view text) noexcept {
  text = text.substr(0, kMaxText);
  text = text.substr(0, text.find('\0'));
  return text.substr(0, validUtf8Prefix(text));
}

/// Appends a frame's length and makes room for the rest, all in one step: when there is no memory,
/// `out` is as it was.
char* openFrame(BlockBuilder& out, std::size_t body, std::size_t written) {
  return store(out.extend(kLengthBytes + written), static_cast<std::uint32_t>(body));
}

/// Takes a body apart from front to back.
class Parser {
 public:
  explicit Parser(const Data& body) noexcept : body_(body), left_(body.view()) {}

  template <std::integral T>
  T number() {
    return load<T>(text(sizeof(T)).data());
  }

  std::string_view text(std::size_t length) {
    if (length > left_.size()) throw FrameError("the frame ends too early");
    const std::string_view taken = left_.substr(0, length);
    left_.remove_prefix(length);
    return taken;
  }

  [[nodiscard]] std::string sentence(std::size_t length) {
    const std::string_view taken = text(length);
    if (carried(taken).size() != length) throw FrameError("the frame's text breaks the rules");
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

const std::size_t kMaxRequestBody = kLongestRequest;
const std::size_t kMaxReplyBody = kLongestReply;

Hello Hello::ours() {
  Hello hello;
  hello.messageBytes = limits::messageBytes;
  hello.recordBytes = limits::recordBytes;
  hello.deliveredBytes = limits::deliveredBytes;
  hello.replyBytes = limits::replyBytes;
  hello.nestedContainers = limits::nestedContainers;
  return hello;
}

void appendHello(BlockBuilder& out, const Hello& hello) {
  char* at = openFrame(out, kHelloBody, kHelloBody);
  at = storeText(at, kMagic);
  at = store(at, hello.version);
  at = store(at, hello.confinement);
  at = store(at, hello.messageBytes);
  at = store(at, hello.recordBytes);
  at = store(at, hello.deliveredBytes);
  at = store(at, hello.replyBytes);
  store(at, hello.nestedContainers);
}

Hello parseHello(const Data& body) {
  Parser parser(body);
  if (parser.text(kMagic.size()) != kMagic)
    throw FrameError("the peer is not an unpacking service");
  Hello hello;
  hello.version = parser.number<std::uint16_t>();
  if (hello.version != kVersion) throw FrameError("the service speaks another version");
  if (body.size() != kHelloBody) throw FrameError("the hello has the wrong length");
  hello.confinement = parser.number<std::uint32_t>();
  hello.messageBytes = parser.number<std::uint64_t>();
  hello.recordBytes = parser.number<std::uint64_t>();
  hello.deliveredBytes = parser.number<std::uint64_t>();
  hello.replyBytes = parser.number<std::uint64_t>();
  hello.nestedContainers = parser.number<std::uint32_t>();
  return hello;
}

void appendRequestHead(BlockBuilder& out, std::uint64_t id, std::string_view outputType,
                       std::size_t messageBytes) {
  if (outputType.empty() || outputType.size() > kMaxName) {
    throw FrameError("an output type's name has 1 to 255 bytes");
  }
  const std::size_t head = kRequestHead + outputType.size();
  if (messageBytes > kMaxRequestBody - head) throw FrameError("the message is too long");
  char* at = openFrame(out, head + messageBytes, head);
  at = store(at, id);
  at = store(at, static_cast<std::uint8_t>(outputType.size()));
  storeText(at, outputType);
}

std::size_t requestHeadBytes(std::string_view outputType) noexcept {
  return kLengthBytes + kRequestHead + outputType.size();
}

void appendRequest(BlockBuilder& out, std::uint64_t id, std::string_view outputType,
                   std::string_view message) {
  if (message.size() <= kMaxRequestBody) out.reserve(kMaxRequestHead + message.size());
  appendRequestHead(out, id, outputType, message.size());
  out.append(message);
}

Request parseRequest(const Data& body) {
  Parser parser(body);
  Request request;
  request.id = parser.number<std::uint64_t>();
  const std::size_t nameLength = parser.number<std::uint8_t>();
  if (nameLength == 0) throw FrameError("the request names no output type");
  request.outputType = parser.text(nameLength);
  request.message = parser.rest();
  return request;
}

std::optional<std::uint64_t> requestId(const Data& body) noexcept {
  if (body.size() < sizeof(std::uint64_t)) return std::nullopt;
  return load<std::uint64_t>(body.view().data());
}

std::size_t beginReply(BlockBuilder& out, std::uint64_t id, Status status) {
  const std::size_t start = out.size();
  char* at = openFrame(out, 0, kReplyHead);
  at = store(at, id);
  store(at, static_cast<std::uint8_t>(status));
  return start;
}

void endReply(BlockBuilder& out, std::size_t start) {
  const std::size_t body = out.size() - start - kLengthBytes;
  if (body > kMaxReplyBody) {
    out.truncate(start);
    throw FrameError("the reply is too long");
  }
  store(out.bytes() + start, static_cast<std::uint32_t>(body));
}

void appendRefusal(BlockBuilder& out, std::uint64_t id, const DecodingError& error) {
  const std::string_view path = carried(error.path());
  const std::string_view sentence = carried(error.what());
  const std::size_t body = kReplyHead + kRefusalHead + path.size() + sentence.size();
  char* at = openFrame(out, body, body);
  at = store(at, id);
  at = store(at, static_cast<std::uint8_t>(Status::refused));
  at = store(at, static_cast<std::uint8_t>(error.kind()));
  at = store(at, error.offset().value_or(kNoOffset));
  at = store(at, static_cast<std::uint16_t>(path.size()));
  at = storeText(at, path);
  storeText(at, sentence);
}

void appendSentence(BlockBuilder& out, std::uint64_t id, Status status, std::string_view sentence) {
  sentence = carried(sentence);
  const std::size_t body = kReplyHead + sentence.size();
  char* at = openFrame(out, body, body);
  at = store(at, id);
  at = store(at, static_cast<std::uint8_t>(status));
  storeText(at, sentence);
}

Reply parseReply(const Data& body) {
  Parser parser(body);
  Reply reply;
  reply.id = parser.number<std::uint64_t>();
  const auto status = parser.number<std::uint8_t>();
  if (status > static_cast<std::uint8_t>(Status::failed)) {
    throw FrameError("the reply has an unknown status");
  }
  reply.status = static_cast<Status>(status);
  reply.body = parser.rest();
  return reply;
}

DecodingError parseRefusal(const Data& body) {
  Parser parser(body);
  const auto kind = parser.number<std::uint8_t>();
  if (kind > static_cast<std::uint8_t>(DecodingError::Kind::notEnoughMemory)) {
    throw FrameError("the refusal has an unknown kind");
  }
  const auto offset = parser.number<std::uint64_t>();
  const std::size_t pathLength = parser.number<std::uint16_t>();
  std::string path = parser.sentence(pathLength);
  const std::string sentence = parser.sentence(parser.left());
  return {static_cast<DecodingError::Kind>(kind), std::move(path), sentence,
          offset == kNoOffset ? std::nullopt : std::optional(offset)};
}

std::string parseSentence(const Data& body) {
  Parser parser(body);
  return parser.sentence(parser.left());
}

}  // namespace ironmoat::frames
