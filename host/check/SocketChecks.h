// SPDX-License-Identifier: Apache-2.0
// The socket on which clients would reach the service, and the folder that it lies in. Threads: any.
#pragma once

#include "host/check/Check.h"

namespace tarn::linux_host {

// Whether the service may make its socket there, and nobody may put another in its place.
Check checkSocketDirectory(const CheckSubject& subject);
// Who listens on the path. A service is asked for an answer, which takes five seconds at the most; a socket that the
// service manager holds isn't touched, as a connection would start the service.
Check checkSocket(const CheckSubject& subject);
// The same of the admin socket, which the configuration wants. Where the service manager holds the ordinary one it is
// to hold this one, too.
Check checkAdminSocket(const CheckSubject& subject);

}  // namespace tarn::linux_host
