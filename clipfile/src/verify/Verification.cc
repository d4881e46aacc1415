#include "verify/Verification.h"

#include "reader/FormatError.h"
#include "verify/Rules.h"

namespace clipfile {

Verification VerifyFile(const std::filesystem::path& path, const VerifyOptions& options) {
    const InputFile file(path);
    Verification verification;
    verification.path = path;
    Defects defects(verification.defects);
    try {
        verification.inspection = Inspect(file);
    } catch (const FormatError& error) {
        defects.Add(error.what());
        return verification;
    }
    CheckStructure(file, verification.inspection, defects);
    // An unfinished file keeps none of the rules below, and is to be recovered first.
    if (verification.inspection.recording.completion == Completion::kClosed) {
        CheckTracks(verification.inspection, defects);
        CheckData(file, verification.inspection, defects);
        CheckTimecode(options.name.empty() ? path : options.name, verification.inspection, defects);
        CheckIndex(file, verification.inspection, defects);
        if (options.deep) {
            CheckSamples(file, verification.inspection, options.onSample, defects);
        }
    }
    return verification;
}

}  // namespace clipfile
