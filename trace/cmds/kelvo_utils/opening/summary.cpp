#include "summary.h"

#include "platform.h"
#include "print.h"

namespace {

constexpr uint16_t VERSION_WITH_BUILD_NAME = 2;
constexpr uint16_t VERSION_WITH_NODE_ID = 4;

} // namespace

// The precisions keep a text that fills its field within it.
static_assert(sizeof(trace_file_header::program) == 48);
static_assert(sizeof(trace_file_header::buildName) == 32);
static_assert(sizeof(trace_file_header::baseProgName) == 48);

void print_file_summary(const char* pName, const trace_file_header& header,
                        unsigned int total_files) {
    if (total_files == 1)
        output_message("Filename: %s\n\tProgram Name: %.48s\n\tProperties:", pName, header.program);
    else
        output_message("\tProgram Name: %.48s\n\tProperties:", header.program);
    output_message("%s",
                   header.uProperties & TRC_PROP_LITTLE_ENDIAN ? " Little Endian" : " Big Endian");
    output_message("%s",
                   header.uProperties & TRC_PROP_ADDR_64 ? ", 64-bit mode\n" : ", 32-bit mode\n");
    output_message("\tPlatform: %s\n", platform_name(header.uPlatform));
    output_message("\tFileVersion: %d\n", header.uVersion);
    output_message("\tNode Number: %d\n", header.uNodeNumber);
    output_message("\tProcess Id: %d\n", static_cast<int>(header.uPid));
    output_message("\tMachine Id: 0x%08x\n", header.machineId);
    if (header.uVersion >= VERSION_WITH_NODE_ID)
        output_message("\tNode ID:    0x%llx\n", static_cast<unsigned long long>(header.uNode_ID));
    if (header.uVersion >= VERSION_WITH_BUILD_NAME)
        output_message("\tTrace Library Build Level: %.32s\n", header.buildName);
}

void print_base_program_name(const trace_file_header& header) {
    output_message("%.48s\n", header.baseProgName);
}
