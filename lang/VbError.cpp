#include "lang/VbError.h"

#include <utility>

namespace maroset {

std::string ErrorDescription(int32_t number) {
    switch (number) {
        case err::InvalidProcedureCall:
            return "Invalid procedure call or argument";
        case err::Overflow:
            return "Overflow";
        case err::SubscriptOutOfRange:
            return "Subscript out of range";
        case err::TypeMismatch:
            return "Type mismatch";
        case err::BadFileNameOrNumber:
            return "Bad file name or number";
        case err::FileNotFound:
            return "File not found";
        case err::PathFileAccess:
            return "Path/File access error";
        case err::PathNotFound:
            return "Path not found";
        case err::ObjectNotSet:
            return "Object variable or With block variable not set";
        case err::InvalidUseOfNull:
            return "Invalid use of Null";
        case err::InvalidPropertyValue:
            return "Invalid property value";
        case err::SetNotSupportedAtRunTime:
            return "Set not supported at run time";
        case err::SetNotPermitted:
            return "Set not permitted";
        case err::NotSupported:
            return "Object doesn't support this property or method";
        case err::DuplicateKey:
            return "This key is already associated with an element of this collection";
        case err::NoCurrentRecord:
            return "No current record.";
        case err::CouldNotFindFile:
            return "Could not find file.";
        case err::QuerySyntax:
            return "Syntax error in query expression.";
        case err::TableNotFound:
            return "The Microsoft Jet database engine cannot find the input table or query. "
                   "Make sure it exists and that its name is spelled correctly.";
        case err::CharactersAfterEnd:
            return "Characters found after end of SQL statement.";
        case err::DatabaseExists:
            return "Database already exists.";
        case err::ItemNotFound:
            return "Item not found in this collection.";
        case err::UnrecognizedDatabase:
            return "Unrecognized database format.";
        default:
            return "Application-defined or object-defined error";
    }
}

VbError::VbError(int32_t number, std::string description, std::string source)
    : number_(number),
      description_(description.empty() ? ErrorDescription(number) : std::move(description)),
      source_(std::move(source)) {}

}  // namespace maroset
