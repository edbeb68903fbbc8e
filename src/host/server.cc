#include "host/server.h"

#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <exception>
#include <new>

#include "frames/frame.h"
#include "host/request_loop.h"
#include "ironmoat/errors.h"
#include "sandbox/memory.h"
#include "sandbox/sandbox.h"
#include "values/host_rejection.h"

namespace ironmoat {

using frames::Status;

IronmoatServer& IronmoatServer::service() {
  static IronmoatServer server;
  return server;
}

void IronmoatServer::add(std::string outputType, Handler handler) {
  registrations_.push_back({std::move(outputType), std::move(handler)});
}

void IronmoatServer::answer(const Data& request, BlockBuilder& reply) const {
  const std::uint64_t id = frames::requestId(request).value_or(0);
  const std::size_t start = reply.size();
  const auto withoutRecord = [&]() -> BlockBuilder& {
    reply.truncate(start);
    return reply;
  };
  try {
    const frames::Request parsed = frames::parseRequest(request);
    const auto found = std::find_if(
        registrations_.begin(), registrations_.end(),
        [&](const Registration& known) { return known.outputType == parsed.outputType; });
    if (found == registrations_.end()) {
      return frames::appendDescription(reply, id, Status::notServed, "not a served output type");
    }
    frames::beginReply(reply, id, Status::record);
    withHostRejections([&] { found->handler(parsed.message, reply); });
    frames::endReply(reply, start);
  } catch (const DecodingError& rejection) {
    frames::appendRejection(withoutRecord(), id, rejection);
  } catch (const std::bad_alloc&) {
    withoutRecord();
    throw;
  } catch (const frames::FrameError& error) {
    frames::appendDescription(withoutRecord(), id, Status::notServed, error.what());
  } catch (const std::exception& error) {
    frames::appendDescription(withoutRecord(), id, Status::failed, error.what());
  } catch (...) {
    frames::appendDescription(withoutRecord(), id, Status::failed, "the unpacker failed");
  }
}

void IronmoatServer::serve(const Data& request, BlockBuilder& reply) const {
  try {
    answer(request, reply);
  } catch (const std::bad_alloc&) {
    frames::appendRejection(
        reply, frames::requestId(request).value_or(0),
        {DecodingError::Kind::notEnoughMemory, "", "not enough memory to decode this message"});
  }
}

void IronmoatServer::run() {
  // When the peer stops reading, or the output is a file, the service ends in order.
  static_cast<void>(std::signal(SIGPIPE, SIG_IGN));
  static_cast<void>(std::signal(SIGXFSZ, SIG_IGN));
  sandbox::prepareMemory();
  host::RequestLoop loop(*this, STDIN_FILENO, STDOUT_FILENO);
  frames::Hello hello = frames::Hello::ours();
  try {
    if (sandboxed_ == Sandboxed::yes) hello.sandbox = sandbox::enter();
  } catch (const sandbox::Unavailable& error) {
    std::_Exit(error.exitStatus());
  }
  loop.run(hello);
}

}  // namespace ironmoat
