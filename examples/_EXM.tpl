# The records of component _EXM, which write_trace.cpp writes.
#
# ">>" at the beginning of a text moves the thread's later records two columns
# to the right, "<<" moves them back.
0x10    ">>Copying %u files"
0x11    "Copied \"%s\""
0x12    "<<Copied %d files, "       # the strings of an entry are joined
        "result %d"
