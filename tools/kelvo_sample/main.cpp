#include "options.h"
#include "sample.h"

int main(int argc, char** argv) {
    sample_options options;
    const options_result result = parse_options(argc, argv, &options);
    if (result != options_result::RUN)
        return result == options_result::DONE ? 0 : 1;
    return make_sample(options);
}
