#include "usage.h"

#include "sink.h"

namespace {

constexpr char USAGE[] = R"usage(kelvo [-fhbrl] [-o <dtic>] [-t <templatepath>]
      [-s "<start time>"] filename ...

where:

  -f Format the trace file as records are added to it (like "tail -f").
  -h Displays the usage summary for this command.
  -b Display brief output.
  -r Display raw data.
  -l Load all trace templates in advance (useful when a large number of
     files are processed together and available memory becomes an issue).
  -o Specifies how the fixed information associated with each trace record
     is formatted. Specify one or more characters. The default is "tc".
      d Date in current locale format. (e.g 02/21/99)
      t Time in current locale format with microseconds appended.
        (e.g. hh:mm:ss.xxxxxx)
      i Thread id
      c Component id (e.g."_ZPB")
  -t Specifies a colon-delimited list of directories to search for template
     files.
  -s Specifies the first record to be output.
     The starting record may be specified using one of the following forms.
         "[<date>] [<time>[.<fraction>]]" -or-
         "<+|-><seconds>s"               -or-
         "<+|-><number>r"
     <date> and <time> are specified in the format for the current locale.
     <fraction>, <seconds>, and <number> are specified as decimal integers.
     The second form represents the amount of time from the beginning (+)
     or end (-) of the trace file at which formatting is to begin. The third
     form is similar but specifies the starting point as the number of
     records from the beginning (+) or end (-) of the file.
)usage";

} // namespace

void output_usage() {
    output_text(USAGE);
}
