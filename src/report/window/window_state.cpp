#include "report/window/window_state.h"

namespace report {

WindowState window_state;

}  // namespace report
