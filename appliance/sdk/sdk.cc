// libxavosdk.so.6: the appliance loads it with the printer library, which
// calls nothing in it.  The stand-in only has to exist under that name.
namespace {
[[maybe_unused]] constexpr char kUnit[] = "xavosdk";
}  // namespace
