// Documents: answers of JSON and HTML, made of what may hold any bytes.
#ifndef ZMC_SERVE_DOCUMENTS_H
#define ZMC_SERVE_DOCUMENTS_H

#include <string>
#include <string_view>

#include "describe/JsonNumbers.h"
#include "serve/Answer.h"
#include "serve/Request.h"

namespace zmcserve {

// What is no UTF-8 is replaced.
Answer JsonAnswer(const zmcdescribe::Json& document);
// The document with validators that follow from its text, which is all here, or what the request's
// conditions make of it.
Answer WithTextTag(const Request& request, Answer document);
// A text that differs where the given one does, short, of letters and digits: for ETags.
std::string VariantOf(std::string_view text);

}  // namespace zmcserve

#endif
