// The writers of record bodies, called through the table of kinds between
// output_start_rec and output_end_rec. Main thread only.
//
// Nothing in a body is trusted: counts are taken as written for the layout, but
// only what lies inside the record is read, and no loop runs longer than the
// record's bytes last.
#pragma once

#include "record_kinds.h"

/// A trace id alone, or with one or two values.
void write_values(const record_view& record, const format_entry* pFormat);

/// An array of values.
void write_value_array(const record_view& record, const format_entry* pFormat);

/// A text without trace id.
void write_string(const record_view& record, const format_entry* pFormat);

/// An array of strings.
void write_string_array(const record_view& record, const format_entry* pFormat);

/// Blocks of data; format_data_record does the work and its own lookups.
void write_data(const record_view& record, const format_entry* pFormat);

/// Writes a data record. Returns 1 when a lookup ran out of memory, else 0.
int format_data_record(const record_view& record);

/// An error that the traced program saw; format_error does the work.
void write_error(const record_view& record, const format_entry* pFormat);

/// Writes an error record; `pFormatEntry` may be null. Changes the record copy
/// by the NUL that it may put behind it. Returns 0.
int format_error(const format_entry* pFormatEntry, const record_view& record);

/// The start or restart of the traced program; replaces the file's time base.
void write_start(const record_view& record, const format_entry* pFormat);

/// The notice that the writer discarded records.
void write_discarded(const record_view& record, const format_entry* pFormat);
