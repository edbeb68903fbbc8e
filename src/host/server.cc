#include "host/server.h"

#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <exception>
#include <new>

#include "confinement/confinement.h"
#include "confinement/memory.h"
#include "frames/frame.h"
#include "host/request_loop.h"
#include "ironmoat/errors.h"
#include "values/host_rejection.h"

namespace ironmoat {

using frames::Status;

IronmoatServer& IronmoatServer::service() {
  static IronmoatServer server;
  return server;
}

void IronmoatServer::add(std::string_view outputType, Handler handler) {
  registrations_.push_back({outputType, std::move(handler)});
}

void IronmoatServer::answer(const Data& request, BlockBuilder& reply) const {
  const std::uint64_t id = frames::requestId(request).value_or(0);
  const std::size_t start = reply.size();
  try {
    const frames::Request parsed = frames::parseRequest(request);
    const auto found = std::find_if(
        registrations_.begin(), registrations_.end(),
        [&](const Registration& known) { return known.outputType == parsed.outputType; });
    if (found == registrations_.end()) {
      return frames::appendSentence(reply, id, Status::notServed, "no unpacker for this type");
    }
    const std::size_t frame = frames::beginReply(reply, id, Status::record);
    withHostRejections([&] { found->handler(parsed.message, reply); });
    frames::endReply(reply, frame);
  } catch (const DecodingError& rejection) {
    reply.truncate(start);
    frames::appendRefusal(reply, id, rejection);
  } catch (const std::bad_alloc&) {
    reply.truncate(start);
    throw;
  } catch (const frames::FrameError& error) {
    reply.truncate(start);
    frames::appendSentence(reply, id, Status::notServed, error.what());
  } catch (const std::exception& error) {
    reply.truncate(start);
    frames::appendSentence(reply, id, Status::failed, error.what());
  } catch (...) {
    reply.truncate(start);
    frames::appendSentence(reply, id, Status::failed, "the unpacker failed");
  }
}

void IronmoatServer::serve(const Data& request, BlockBuilder& reply) const {
  try {
    answer(request, reply);
  } catch (const std::bad_alloc&) {
    frames::appendRefusal(
        reply, frames::requestId(request).value_or(0),
        {DecodingError::Kind::notEnoughMemory, "", "not enough memory to decode this message"});
  }
}

namespace {

std::uint32_t confineOrExit() {
  try {
    return confinement::confine();
  } catch (const confinement::CannotConfine& error) {
    std::_Exit(error.exitStatus());
  }
}

}  // namespace

void IronmoatServer::run() {
  // A peer that stops reading is an end, not a crash; so is output that is a file.
  static_cast<void>(std::signal(SIGPIPE, SIG_IGN));
  static_cast<void>(std::signal(SIGXFSZ, SIG_IGN));
  confinement::prepareMemory();
  host::RequestLoop loop(*this, STDIN_FILENO, STDOUT_FILENO);
  frames::Hello hello = frames::Hello::ours();
  if (confine_ == Confine::yes) hello.confinement = confineOrExit();
  loop.run(hello);
}

}  // namespace ironmoat
