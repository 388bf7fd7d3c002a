// SPDX-License-Identifier: Apache-2.0
// Between the values that owners of a client see and those of the wire. Stateless. Threads: any.
#pragma once

#include "client/Reply.h"
#include "plist/Dictionary.h"
#include "plist/ValueView.h"

#include <tarnkit/Reply.h>
#include <tarnkit/Value.h>

namespace tarn::client {

// A copy of it in the packed form, made in one allocation a container. An empty dictionary where a key is given twice,
// which a tarnkit::Dictionary can't have.
// Members in their order.
plist::Dictionary packed(const tarnkit::Dictionary& dictionary);
// A copy of a present value, containers and all. An absent one would come out as an empty text.
tarnkit::Value unpacked(const plist::ValueView& value);
// The reply with values of the owner's own; outcome and error as they are.
tarnkit::Reply unpacked(Reply&& reply);

}  // namespace tarn::client
