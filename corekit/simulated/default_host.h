// The description of the host that is simulated when no other is named.
#pragma once

const char *DefaultHostText();
