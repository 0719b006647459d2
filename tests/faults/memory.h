#pragma once

// The bytes that are allocated now, as they were asked for.
long memory_in_use();
