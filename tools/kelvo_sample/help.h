// The text of kelvo_sample --help.
#pragma once

inline constexpr char HELP_TEXT[] = R"(Usage: kelvo_sample [option...]
Makes a directory of sample traces with the template files that print them, or
keeps appending to such traces (--live). The same options make the same bytes.

Where and how much:
  -d, --directory=DIR    directory for NAME.trc and COMP.tpl, made if it is not
                         there (default kelvo-samples). Files of the same names
                         are replaced, other files are left alone.
  -n, --files=N          number of trace files (default 3). The story takes
                         three files for each run of its service.
  -r, --records=N        records per file (default: the story as it is told,
                         1000 for the other profiles, no end with --live)
      --count=N          the same
  -s, --file-size=SIZE   size of a file, with k, M or G for 1024, 1024^2 or
                         1024^3 bytes. Smaller than the records need: the ring
                         wraps and the oldest are lost. (Default: all records
                         fit, 1M with --live. In the story as it is told the
                         storage daemon's ring has wrapped.)

What:
  -p, --profile=PROFILE  what the records say:
                           story    a gateway, an order service and a storage
                                    daemon at work (default)
                           plain    one number
                           numbers  three numbers and a string
                           strings  two strings
                           data     a number, a string, a formatted block and a
                                    hex dump
                           mixed    every kind of record, nested calls
                         Records of kinds 17, 19 and 0xFFFE (in story and
                         mixed) stand in the files but are not printed.
      --numbered         number the records of each file from 0 on, instead of
                         random values, dropped records included: gaps show
                         what is missing (not for story and mixed; without -p
                         it means plain)
      --record-size=SIZE length of records that can have any: strings, data,
                         and those kinds in mixed (default 128)
      --threads=N        threads that write to each file (default 4; the story
                         has its own)
      --addr=32|64       addressing mode of the traced programs (default 64)
      --seed=N           choose other contents (default 1)

When:
      --start=TIME       time of the first record, "YYYY-MM-DD HH:MM:SS" in the
                         traces' time zone, or @SECONDS since the epoch
                         (default 2026-03-14 14:03:05)
      --step=TIME        time from one record to the next, with ns, us, ms or s
                         (default 10us; the story has its own)
      --times=interleave|sequential
                         whether records of all files alternate in time, or
                         each file begins when the one before it has ended
                         (default interleave; in the story each run of the
                         service counts as one)
      --distinct-bases   every file counts time from a moment of its own (the
                         story's files always do)
      --zone=MINUTES     time zone in the files, minutes west of UTC, or "none"
                         (default -60)

Live:
      --live             append to the files, with the time of day, until
                         SIGINT, SIGTERM, --records or --seconds; tell at the
                         end what was written and what was dropped because a
                         reader could not keep up. --start, --step and --times
                         have no meaning then.
      --rate=N           records per second and file (default 5; 0: as many as
                         can be written)
      --seconds=N        stop after N seconds

  -h, --help             print this text

Examples:
  kelvo_sample && kelvo -t kelvo-samples kelvo-samples/*.trc
  kelvo_sample -d big -p mixed -n 8 -r 1000000
  kelvo_sample -d live --live & kelvo -f -t live live/*.trc

The exit status is 0, or 1 after a message on standard error.
)";
