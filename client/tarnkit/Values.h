// Between the values that owners of a client see and those of the wire. Stateless. Threads: any.
#pragma once

#include "client/Reply.h"
#include "plist/Dictionary.h"
#include "plist/ValueView.h"

#include <tarnkit/Reply.h>
#include <tarnkit/Value.h>

namespace tarn::client {

plist::Dictionary packed(const tarnkit::Dictionary& dictionary);
// Of a present value.
tarnkit::Value unpacked(const plist::ValueView& value);
tarnkit::Reply unpacked(Reply&& reply);

}  // namespace tarn::client
