// All of Asio that is not templates, compiled here and nowhere else.
#include <asio/impl/src.hpp>
