// The rest of what the headers under test include: it is in windows.h here.
#pragma once
