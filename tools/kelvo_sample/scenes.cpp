// Each scene is a piece of dialogue: one line is one record, which begins with
// the microseconds since the line before it.
#include "scenes.h"

#include "templates.h"

#include <cmath>
#include <string>

namespace {

constexpr uint32_t GATEWAY_MAIN = 0x1a2b;
constexpr uint32_t GATEWAY_WORKER = 0x1a31;
constexpr uint32_t ORDERS_MAIN = 0x2c04;
constexpr uint32_t ORDERS_WORKER = 0x2c0a;
constexpr uint32_t STORAGE_MAIN = 0x3e10;
constexpr uint32_t STORAGE_DISK = 0x3e15;
constexpr uint32_t WORKERS = 2;

struct product {
    std::string_view name;
    double price;
};
constexpr product PRODUCTS[] = {{"garden chair", 39.95}, {"folding table", 84.50},
                                {"rain barrel", 59.00},  {"bird house", 17.25},
                                {"watering can", 12.80}, {"hammock", 74.90}};

struct customer {
    std::string_view name;
    std::string_view address;
    char cClass;
    int64_t iNumber;
    float fDistance; ///< milliseconds
};
constexpr customer CUSTOMERS[] = {{"E. Lindqvist", "10.0.4.17", 'A', 70412, 3.2F},
                                  {"J. Okafor", "10.0.9.203", 'B', 70988, 11.8F},
                                  {"M. Sarrazin", "10.0.7.66", 'A', 69075, 5.0F},
                                  {"T. Brandvold", "10.0.2.140", 'C', 71533, 27.4F}};

constexpr std::string_view NOTES[] = {"leave at the door", "a gift", "call first", "no hurry"};
constexpr uint32_t ORDERS_PER_PAGE = 8;

template <class T, size_t N> const T& one_of(service& s, const T (&table)[N]) {
    return table[s.random.below(N)];
}

/// An order, and the threads that deal with it.
struct order {
    explicit order(service& s)
        : theCustomer(one_of(s, CUSTOMERS)), theProduct(one_of(s, PRODUCTS)),
          uNumber(48213 + s.uRequests), uQuantity(1 + s.random.below(4)),
          uWorker(s.uRequests % WORKERS), sName("order/" + std::to_string(uNumber)),
          sKey("stock/" + std::string(theProduct.name)), gwy(s, GATEWAY, GATEWAY_WORKER + uWorker),
          ord(s, ORDERS, ORDERS_WORKER + uWorker), sto(s, STORAGE, STORAGE_DISK) {
        ++s.uRequests;
    }

    /// The request has come.
    void begin(const service& s) {
        uBegan = s.now();
    }

    double milliseconds_taken(const service& s) const {
        return static_cast<double>(s.now() - uBegan) / 1e6;
    }

    double total() const {
        return uQuantity * theProduct.price;
    }

    const customer& theCustomer;
    const product& theProduct;
    uint32_t uNumber;
    uint32_t uQuantity;
    uint32_t uWorker;
    std::string sName;
    std::string sKey;
    uint64_t uBegan = 0;
    voice gwy;
    voice ord;
    voice sto;
};

void play_request(service& s, order& o) {
    const customer& c = o.theCustomer;
    o.gwy.strings(130'000 + s.random.below(90'000), GWY_REQUEST, {"POST", "/orders"});
    o.begin(s);
    const auto uRequestId = static_cast<uint32_t>(s.random.next());
    o.gwy.uint32_2(11, GWY_REQUEST_ID, uRequestId, 180 + s.random.below(300));
    o.gwy.data(14, GWY_CLIENT, {block(c.address), block(c.cClass), block(c.fDistance)});
    o.gwy.strings(9, GWY_ASK, {"order service"});
    o.ord.uint32(61, ORD_PLACE, o.uNumber);
    o.ord.data(12, ORD_CUSTOMER,
               {block(c.name), sample_bytes().add_long(c.iNumber, s.options.uAddrBits)});
    o.ord.data(8, ORD_ITEM,
               {block(static_cast<int8_t>(o.uQuantity)), block(o.theProduct.name),
                block(o.theProduct.price)});
}

void play_reservation(service& s, const order& o, int iLeft) {
    o.ord.strings(10, ORD_RESERVE, {o.theProduct.name});
    o.sto.strings(55, STO_READ, {o.sKey});
    o.sto.uint64_2(7, STO_PAGE, 0x7000 + s.random.below(0x1000), 4096);
    o.sto.int64(88, STO_FOUND, 100 + s.random.below(900));
    o.ord.int32_2(43, ORD_RESERVED, -static_cast<int32_t>(o.uQuantity), iLeft);
}

/// The journal entry of an order: its number, the order, a note, and for the
/// first order of a page the head of that page as it is.
void write_journal(service& s, const order& o) {
    sample_bytes packed = block(o.uNumber, static_cast<int16_t>(o.uQuantity), o.theCustomer.cClass);
    packed.align(8).add(o.total());
    const sample_bytes entry = block(uint32_t{9000} + s.uRequests);
    const sample_bytes note = block(one_of(s, NOTES));
    if (s.uRequests % ORDERS_PER_PAGE != 1) {
        o.sto.data(16, STO_JOURNAL, {entry, packed, note});
        return;
    }
    const sample_bytes head = block("PAGE", uint8_t{2}, uint16_t{0x0110}, o.uNumber,
                                    static_cast<uint32_t>(s.random.next()));
    o.sto.data(16, STO_JOURNAL, {entry, packed, note, head});
}

void say_volume_full(const voice& sto, int iPagesNeeded) {
    cu_error_arg_t args[2] = {};
    args[0].cu_arg_type = CU_ERROR_ARG_CHAR_STR;
    args[0].cu_arg_value.cu_arg_char_str = "data1";
    args[1].cu_arg_type = CU_ERROR_ARG_INT;
    args[1].cu_arg_value.cu_arg_int = iPagesNeeded;
    trace_error_content error;
    error.traceId = STO_ERROR;
    error.errorId = 28;
    error.lineNumber = 412;
    error.funcName = "grow_volume";
    error.fileName = "volume.c";
    error.ffdcId = "7K2Q-0314-A";
    error.msgSetNumber = 1;
    error.msgNumber = 12;
    error.msgCatName = "storaged.cat";
    error.defMsg = "volume %s is full, %d pages needed";
    error.args = args;
    sto.error(410, error);
}

void play_answer(const order& o, double milliseconds, int iStatus, gateway_id reason) {
    o.gwy.data(58, GWY_ANSWERED, {block(milliseconds)});
    o.gwy.int32_2(13, GWY_STATUS, iStatus, static_cast<int32_t>(reason));
}

} // namespace

void play_opening(service& s, int iSegments) {
    const voice sto(s, STORAGE, STORAGE_MAIN);
    const voice ord(s, ORDERS, ORDERS_MAIN);
    const voice gwy(s, GATEWAY, GATEWAY_MAIN);
    sto.start(0);
    for (int i = 1; i <= iSegments; ++i)
        sto.int32_2(48'000, STO_SCRUB, i, iSegments);
    sto.uint64_2(21'000, STO_SCRUB_DONE, static_cast<uint64_t>(iSegments) * 1024, 0);
    // Until here the daemon's clock was off; see the file's header.
    sto.time_calibration(4'000);

    ord.restart(150'000, "core dumped in check_price");
    ord.start(20);
    ord.text(3'100, "3 orders recovered from the journal");
    ord.strings(700, ORD_CONFIG, {"Garden & More", "euros"});
    gwy.start(52'000);
    gwy.values(1'200, GWY_LIMITS, {4, 64, 250});
    gwy.strings(90, GWY_LISTENING, {"10.0.0.1", "8443"});
}

void play_order(service& s, bool bProbe) {
    order o(s);
    play_request(s, o);
    play_reservation(s, o, 8 + static_cast<int>(s.random.below(20)));
    o.ord.id(9, ORD_STORE);
    o.sto.strings(57, STO_WRITE, {o.sName});
    if (bProbe)
        play_health(s);
    write_journal(s, o);
    o.sto.uint32(120, STO_FILL, 61 + s.random.below(9));
    o.sto.uint64(210, STO_WRITTEN, s.random.next());
    o.ord.uint64(47, ORD_STORED, 1 + s.random.below(3));
    o.ord.data(10, ORD_COMPLETE, {block(o.total())});
    play_answer(o, o.milliseconds_taken(s), 201, GWY_REASON_CREATED);
}

void play_refusal(service& s) {
    order o(s);
    ++s.uFailed;
    play_request(s, o);
    play_reservation(s, o, 8 + static_cast<int>(s.random.below(20)));
    o.ord.id(9, ORD_STORE);
    o.sto.strings(57, STO_WRITE, {o.sName});
    o.sto.uint32(30, STO_FILL, 100);
    say_volume_full(o.sto, 2 + static_cast<int>(s.random.below(7)));
    o.sto.id(12, STO_FAILED);
    o.ord.id(44, ORD_NOT_STORED);
    o.ord.data(15, ORD_GIVE_BACK,
               {block(static_cast<int8_t>(o.uQuantity)), block(o.theProduct.name)});
    o.ord.int32(9, ORD_REFUSED, 28);
    play_answer(o, o.milliseconds_taken(s), 503, GWY_REASON_LATER);

    const auto uVolume = static_cast<uint32_t>(s.random.next());
    const voice sto(s, STORAGE, STORAGE_MAIN);
    sto.data(35'000, STO_GROWN,
             {block("data1"), block(512), block(4),
              block(uint16_t{0x0021}, uint16_t{0xffff}, uVolume, 1U, 0U, o.uNumber)});
}

void play_health(service& s) {
    const voice gwy(s, GATEWAY, GATEWAY_MAIN);
    gwy.id(35, GWY_HEALTH);
    gwy.int64(6, GWY_OLDEST, 400 + s.random.below(500));
    gwy.int32_2(8, GWY_STATUS, 200, GWY_REASON_HEALTHY);
}

void play_totals(service& s) {
    const voice gwy(s, GATEWAY, GATEWAY_MAIN);
    const voice sto(s, STORAGE, STORAGE_MAIN);
    const int64_t iSkew = -200 + static_cast<int64_t>(s.random.below(400));
    gwy.values64(2'000, GWY_TOTALS, {s.uRequests, s.uFailed, uint64_t{s.uRequests} * 2311});
    gwy.int64_2(40, GWY_SKEW, iSkew, -iSkew / 2);
    gwy.discarded(10);
    sto.values(300, STO_TOTALS, {s.uRequests, s.uRequests, s.uFailed});
}
