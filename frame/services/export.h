#pragma once

// KFS_SERVICE_API marks what the services export: functions, static data and whole classes. It is a mark of its own
// because a host may bring other services; libkfs then links those, and exports nothing in their name.
#define KFS_SERVICE_API __attribute__((visibility("default")))
