#include "host/server.h"

#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <exception>
#include <new>
#include <thread>

#include "frames/frame.h"
#include "host/connection.h"
#include "ironmoat/errors.h"

namespace ironmoat {

using frames::Status;

IronmoatServer& IronmoatServer::service() {
  static IronmoatServer server;
  return server;
}

void IronmoatServer::add(std::string_view outputType, Handler handler) {
  registrations_.push_back({outputType, std::move(handler)});
}

void IronmoatServer::serve(const Data& body, BlockBuilder& reply) const {
  const std::uint64_t id = frames::requestId(body).value_or(0);
  const std::size_t start = reply.size();
  try {
    const frames::Request request = frames::parseRequest(body);
    const auto found = std::find_if(
        registrations_.begin(), registrations_.end(),
        [&](const Registration& known) { return known.outputType == request.outputType; });
    if (found == registrations_.end()) {
      return frames::appendSentence(reply, id, Status::notServed, "no unpacker for this type");
    }
    const std::size_t frame = frames::beginReply(reply, id, Status::record);
    found->handler(request.message, reply);
    return frames::endReply(reply, frame);
  } catch (const DecodingError& error) {
    reply.truncate(start);
    frames::appendRefusal(reply, id, error);
  } catch (const frames::FrameError& error) {
    reply.truncate(start);
    frames::appendSentence(reply, id, Status::notServed, error.what());
  } catch (const std::bad_alloc&) {
    reply.truncate(start);
    frames::appendRefusal(
        reply, id,
        {DecodingError::Kind::limitExceeded, "", "the message takes more memory than there is"});
  } catch (const std::exception& error) {
    reply.truncate(start);
    frames::appendSentence(reply, id, Status::failed, error.what());
  }
}

void IronmoatServer::run() {
  std::signal(SIGPIPE, SIG_IGN);  // a peer that stops reading is an end, not a crash
  host::ReplySink sink(STDOUT_FILENO);
  host::RequestSource source(STDIN_FILENO);

  BlockBuilder hello;
  frames::appendHello(hello, frames::Hello::ours());
  sink.send(hello.finish());

  // Leader and followers: whoever holds the source takes the next request out and serves it, while
  // the next one takes its place.
  const auto work = [&] {
    while (!sink.broken()) {
      BlockBuilder reply(Sharing::oneThread);
      try {
        const std::optional<Data> request = source.next();
        if (!request) return;
        serve(*request, reply);
      } catch (const frames::FrameError& error) {
        frames::appendSentence(reply, 0, Status::notServed, error.what());
      }
      sink.send(reply.finish());
    }
    source.close();
  };
  const unsigned threads = std::clamp(std::thread::hardware_concurrency(), 2U, 8U);
  std::vector<std::jthread> followers;
  for (unsigned i = 1; i < threads; ++i) followers.emplace_back(work);
  work();
}

}  // namespace ironmoat
