#include "inspect/options.h"

namespace ironmoat::inspect {

std::string_view helpText() noexcept {
  return R"(Usage: vesk-unpack [OPTION...] [FILE...]
       vesk-unpack --schema TYPE [--format FORMAT]
       vesk-unpack --self-test

Has each FILE, one property-list message (binary or XML), unpacked by the
service VeskIronmoatService in a process of its own, and prints the record, or
why the message was refused and where. Without FILE, or for -, reads standard
input.

  --type TYPE        what the messages are: payload (default), command-response,
                     web-tunnel-response; or auto, to try all of them and take
                     the record that got most of the message
  --format FORMAT    text (default), for people: records on standard output,
                     refusals on standard error, long values cut; or
                     json, for programs: one line for each FILE, in order,
                     {"file": F, "record": {...}} or
                     {"file": F, "error": {"kind": K, "path": P, "message": M}}
  --summary          print only how many messages were accepted, and how many
                     failed with each kind of error
  --quiet, -q        print nothing: the exit status tells
  --schema TYPE      show the fields of the record TYPE, of the records in it,
                     and their keys in messages and in the paths of errors
  --service PROGRAM  use this service, not the one that came with this tool
  --self-test        show what confines the service, and what comes of what is
                     forbidden to it
  --help, -h         print this
  --version          print the version

Kinds of error: malformed, limitExceeded, typeMismatch, outOfRange, keyNotFound,
rejectedByHost (the message was refused), noTypeFits (every type refused it, for
different reasons), crashed, timedOut (the service failed over it), unavailable
(no service could be had), unreadable (FILE could not be read).

Exit status: 0 all unpacked; 1 some message refused, or the service failed over
it, or it is not confined as it has to be; 2 wrong usage, a FILE that could not
be read, no service, output not writable.
)";
}

}  // namespace ironmoat::inspect
