#include "AppRegistry/ARLog.h"

const platform::log::Category& ARLog() {
    static const platform::log::Category category("ar");
    return category;
}
