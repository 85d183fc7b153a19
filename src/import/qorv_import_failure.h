// Failures of the import road. An importer reads an archive that may be broken in many ways, and a
// run over several archives goes on after one of them fails; so its readers do not end the
// process: they throw a CImportFailure with a failure id of the catalogue (CQORV_ERR_IMPORT_* and
// the file ids 2611xx) and a parameter that names what is wrong, and the program that drives them
// removes what the failed import began and reports the id on the system's road.
#pragma once

#include <stdexcept>
#include <string>

#include "qorv_errors.h"

class CImportFailure : public std::runtime_error {
public:
    CImportFailure(int theId, const std::string& theParameter) : std::runtime_error(theParameter), mId(theId) {}
    /// The failure id of the catalogue.
    int id() const { return mId; }
    /// The words that name the value, record or file at fault.
    const char* parameter() const { return what(); }

private:
    int mId;
};

/// Throws a CImportFailure.
[[noreturn]] inline void fqorvImportFail(int theId, const std::string& theParameter)
{
    throw CImportFailure(theId, theParameter);
}
