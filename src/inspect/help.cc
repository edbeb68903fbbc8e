#include "inspect/options.h"

namespace ironmoat::inspect {

std::string_view helpText() noexcept {
  return R"(Usage: vesk-unpack [OPTION...] [FILE...]
       vesk-unpack --schema TYPE [--format FORMAT]
       vesk-unpack --self-test

Sends each FILE, one property-list message (binary or XML), to the service
VeskIronmoatService, which parses it in a sandboxed process, and prints the
record, or why and where the service rejected the message. Without FILE, or for
-, reads standard input.

  --type TYPE        decode messages as payload (default), command-response or
                     web-tunnel-response; or auto, which tries all types and
                     shows the record with the most fields of the message
  --format FORMAT    text (default), for people: records on standard output,
                     rejections on standard error, long values cut; or
                     json, for programs: one line for each FILE, in order,
                     {"file": F, "record": {...}} or
                     {"file": F, "error": {"kind": K, "path": P, "message": M}}
  --exact-integers   in JSON, write the integers of records as strings, for
                     programs that would round them to 53 bits
  --strict           list unknown keys, which no field has, instead of only
                     counting them, and let them set the exit status
  --recursive, -r    read all regular files in each FILE that is a folder
  --files-from LIST  read the files that LIST names, too, one a line, or
                     NUL-separated; LIST may be - for standard input
  --summary          print only how many messages the service accepted, how many
                     failed with each kind of error, and how fast
  --quiet, -q        print nothing; only set the exit status
  --schema TYPE      show the fields of the record TYPE, of the records in it,
                     and their keys in messages and in the paths of errors
  --service PROGRAM  start this service, not the one that came with this tool
  --self-test        show the service's sandbox, and try what it forbids
  --help, -h         print this help
  --version          print the version, and that of the frames on the wire

Kinds of error: malformed, limitExceeded, typeMismatch, outOfRange, keyNotFound,
rejectedByHost (the service rejected the message), noTypeFits (it rejected the
message as each type, for different reasons), crashed, timedOut (it failed on
the message), unavailable (no service could be started), unreadable (FILE could
not be read).

Exit status: 0 if the service accepted all messages; 1 if it rejected or failed
on one, or its sandbox is incomplete; 2 for wrong usage, a FILE that could not
be read, no service, or output that could not be written; otherwise, with
--strict, 3 if a message has unknown keys.
)";
}

}  // namespace ironmoat::inspect
