// Makes, fills, asks and releases one template. Main thread only.
#pragma once

#include "kelvo.h"

#include <cstdio>
#include <cstring>
#include <memory>

/// A number below 1 << iBits that parts component ids (4 characters) well.
inline uint32_t component_hash(const char* compId, int iBits) {
    uint32_t uId;
    std::memcpy(&uId, compId, sizeof(uId));
    return uId * 2654435769U >> (32 - iBits);
}

/// Releases a template with its entries and its index.
void release_template(template_file* pTemplate);

/// Releases the entries of a template and its index; the template is then empty.
void release_formats(template_file* pTemplate);

struct template_releaser {
    void operator()(template_file* pTemplate) const {
        release_template(pTemplate);
    }
};
using template_owner = std::unique_ptr<template_file, template_releaser>;

/// A new template without entries for the component whose id begins at `compId`
/// (4 characters), or null when memory is exhausted.
template_owner make_template(const char* compId);

struct file_closer {
    void operator()(FILE* pFile) const {
        std::fclose(pFile);
    }
};
using file_owner = std::unique_ptr<FILE, file_closer>;

/// Parses `pFile` into the template and indexes what it holds. Result and flag
/// are those of parse_template_file; the caller closes `pFile`.
int read_template(template_file* pTemplate, const char* pFileName, FILE* pFile,
                  int* p_insufficient_resources);

/// The same for the file of a name. Returns -1 when that cannot be opened. What is no
/// regular file counts as empty: reading a FIFO or a device could hang the run.
int read_template_file(template_file* pTemplate, const char* pFileName,
                       int* p_insufficient_resources);

/// The newest entry with this trace id, whatever its block id, or null.
format_entry* find_newest_format(const template_file* pTemplate, int32_t trace_id);

/// The newest entry with this trace id and block id, or null.
format_entry* find_format(const template_file* pTemplate, uint32_t trace_id, int block_id);
