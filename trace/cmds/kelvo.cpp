#include "kelvo.h"

char pDefTemplatePath[] = "/opt/vantor/trctmplts:.";

kelvo_globals_opts anchor = [] {
    kelvo_globals_opts start{};
    start.bMicroSec = 1;
    start.pTemplatePath = pDefTemplatePath;
    start.outputOptions[0] = 't';
    start.outputOptions[1] = 'i';
    start.outputOptions[2] = 'c';
    return start;
}();

TrcFmtngProcCtrl Glbl_TrcFmtngProcCtrl;

int32_t memory_is_restricted = 0;
int32_t queue_limit_enabled = 1;
int32_t bShowProgress = 0;
uint32_t total_tf_count = 0;
