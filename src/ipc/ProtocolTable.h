#pragma once

#include "ipc/IPCCoding.h"
#include "platform/IPC.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <functional>
#include <memory>
#include <string_view>
#include <tuple>
#include <type_traits>
#include <utility>

/// A protocol is an abstract class and one table that names its messages. Everything else — what the peer may
/// send, who serves it, how it is sent, the introspection file — follows from the table and from the types of
/// the member functions:
///
///     template <>
///     struct ProtocolTable<Greeter> {
///         static constexpr std::string_view kName = "com.example.Greeter";
///         static constexpr std::tuple kMessages{
///             Message<&Greeter::greet>{{"greet", "Asks for a greeting."},
///                                      {Named{"name", "who is to be greeted"}},
///                                      {Named{"greeting", "what to say to them"}}},
///         };
///     };
///
/// A last parameter of type `std::function<void(...)>` is the message's handler: its parameters are the
/// reply.
namespace kelvo {

/// A message or one of its values: its name on the wire, and what the introspection file says about it.
struct Named {
    std::string_view name;
    std::string_view documentation;

    constexpr Named(const char* itsName, const char* itsDocumentation = "")
        : name(itsName), documentation(itsDocumentation) {}
};

template <typename Protocol>
struct ProtocolTable;

namespace detail {

template <typename... Types>
struct TypeList {
    static constexpr std::size_t kSize = sizeof...(Types);
};

template <typename Type>
struct HandlerTraits {
    static constexpr bool kIsHandler = false;
    using Values = TypeList<>;
};
template <typename... Values_>
struct HandlerTraits<std::function<void(Values_...)>> {
    static constexpr bool kIsHandler = true;
    using Values = TypeList<std::remove_cvref_t<Values_>...>;
};

/// A message's parameters without their handler, and the handler.
template <typename Done, typename... Rest>
struct SplitParameters;
template <typename... Done>
struct SplitParameters<TypeList<Done...>> {
    using Arguments = TypeList<Done...>;
    using Handler = void;
};
template <typename... Done, typename Last>
struct SplitParameters<TypeList<Done...>, Last> {
    using Type = std::remove_cvref_t<Last>;
    static constexpr bool kIsHandler = HandlerTraits<Type>::kIsHandler;
    using Arguments = std::conditional_t<kIsHandler, TypeList<Done...>, TypeList<Done..., Type>>;
    using Handler = std::conditional_t<kIsHandler, Type, void>;
};
template <typename... Done, typename First, typename Second, typename... Rest>
struct SplitParameters<TypeList<Done...>, First, Second, Rest...>
    : SplitParameters<TypeList<Done..., std::remove_cvref_t<First>>, Second, Rest...> {};

template <typename Member>
struct MemberTraits;
template <typename Protocol_, typename... Parameters>
struct MemberTraits<void (Protocol_::*)(Parameters...)> {
    using Protocol = Protocol_;
    using Split = SplitParameters<TypeList<>, Parameters...>;
    using Arguments = typename Split::Arguments;
    using Handler = typename Split::Handler;
    static constexpr bool kHasHandler = !std::is_void_v<Handler>;
    using Reply = typename HandlerTraits<Handler>::Values;
};

template <std::size_t Count, typename... Types>
std::vector<IPCArgument> describe(TypeList<Types...>, const std::array<Named, Count>& values) {
    static_assert(Count == sizeof...(Types));
    std::vector<IPCArgument> described;
    [[maybe_unused]] auto value = values.begin();
    (described.push_back({std::string(value->name), IPCCoding<Types>::signature(), kAllowedObjects<Types>,
                          std::string((value++)->documentation)}),
     ...);
    return described;
}

/// Whether arguments are those of a frame: a surface, and the bytes of a record about it.
template <typename Arguments>
struct FrameTraits {
    static constexpr bool kIsFrame = false;
};
template <std::size_t Size>
struct FrameTraits<TypeList<std::shared_ptr<KVIOSurfaceObject>, std::array<std::byte, Size>>> {
    static constexpr bool kIsFrame = true;
    using Record = std::array<std::byte, Size>;
};

/// Calls `use` with the values as their C++ types. False when their number or one of them is wrong.
template <typename... Types, typename Use, std::size_t... Places>
bool withDecoded(TypeList<Types...>, const Array& values, const Use& use, std::index_sequence<Places...>) {
    if (values.size() != sizeof...(Types)) return false;
    [[maybe_unused]] const auto parts = std::tuple(IPCCoding<Types>::decode(values[Places])...);
    if (!(std::get<Places>(parts).has_value() && ...)) return false;
    use(*std::get<Places>(parts)...);
    return true;
}
template <typename... Types, typename Use>
bool withDecoded(TypeList<Types...> types, const Array& values, const Use& use) {
    return withDecoded(types, values, use, std::index_sequence_for<Types...>());
}

/// A handler that sends what it is called with; empty when no reply is wanted.
template <typename... Values>
std::function<void(Values...)> replyingHandler(std::type_identity<std::function<void(Values...)>>,
                                               IPCReply reply) {
    if (!reply) return nullptr;
    return [reply = std::move(reply)](Values... values) {
        reply({IPCCoding<std::remove_cvref_t<Values>>::encode(values)...});
    };
}

/// What calls `handler` with a reply's values; those that do not fit are an error.
template <typename Handler>
IPCReply decodingReply(Handler handler, std::function<void(const KVError&)> errorHandler) {
    if (!handler) return nullptr;
    return [handler = std::move(handler), errorHandler = std::move(errorHandler)](const Array& values) {
        const bool fits = withDecoded(typename HandlerTraits<Handler>::Values(), values, handler);
        if (!fits && errorHandler) errorHandler(KVError::posix(EBADMSG, "reply"));
    };
}

}  // namespace detail

/// One row of a table: the member function, its name, and those of its arguments and of its reply's values.
template <auto Member>
struct Message {
    using Traits = detail::MemberTraits<decltype(Member)>;
    using Protocol = typename Traits::Protocol;
    static constexpr auto kMember = Member;

    Named message;
    std::array<Named, Traits::Arguments::kSize> arguments{};
    std::array<Named, Traits::Reply::kSize> reply{};

    IPCMethod description() const {
        IPCMethod method{std::string(message.name),
                         detail::describe(typename Traits::Arguments(), arguments),
                         {},
                         std::string(message.documentation)};
        if constexpr (Traits::kHasHandler) method.reply = detail::describe(typename Traits::Reply(), reply);
        return method;
    }

    /// Calls the member function with these arguments. False when they do not fit.
    static bool call(Protocol& target, const Array& values, [[maybe_unused]] IPCReply answer) {
        return detail::withDecoded(typename Traits::Arguments(), values, [&](const auto&... decoded) {
            if constexpr (Traits::kHasHandler) {
                (target.*Member)(decoded...,
                                 detail::replyingHandler(std::type_identity<typename Traits::Handler>(),
                                                         std::move(answer)));
            } else {
                (target.*Member)(decoded...);
            }
        });
    }

    /// The same for a frame. False also when the member function takes none.
    static bool callWithFrame([[maybe_unused]] Protocol& target, [[maybe_unused]] const IPCFrame& frame) {
        using Frame = detail::FrameTraits<typename Traits::Arguments>;
        if constexpr (Frame::kIsFrame && !Traits::kHasHandler) {
            typename Frame::Record record;
            if (frame.record.size() != record.size()) return false;
            std::ranges::copy(frame.record, record.begin());
            const auto object = std::make_shared<KVIOSurfaceObject>();
            object->setIOSurface(frame.surface);
            (target.*Member)(object, record);
            return true;
        } else {
            return false;
        }
    }
};

/// The interface of a protocol, made once.
template <typename Protocol>
const std::shared_ptr<const IPCInterface>& interfaceOf() {
    static const auto interface = std::apply(
        [](const auto&... messages) {
            return std::make_shared<const IPCInterface>(
                IPCInterface{std::string(ProtocolTable<Protocol>::kName), {messages.description()...}});
        },
        ProtocolTable<Protocol>::kMessages);
    return interface;
}

/// The row of a member function.
template <auto Member>
constexpr std::size_t messageIndex() {
    using Protocol = typename detail::MemberTraits<decltype(Member)>::Protocol;
    return std::apply(
        [](const auto&... messages) {
            std::size_t index = 0;
            std::size_t found = sizeof...(messages);
            const auto look = [&](const auto& message) {
                using Row = std::remove_cvref_t<decltype(message)>;
                if constexpr (std::is_same_v<Row, Message<Member>>) found = index;
                ++index;
            };
            (look(messages), ...);
            return found;
        },
        ProtocolTable<Protocol>::kMessages);
}

/// Calls an object of the protocol with what arrives. The object is held weakly; once it has gone, messages
/// are dropped.
template <typename Protocol>
class ProtocolDispatcher : public IPCExportedObject {
  public:
    explicit ProtocolDispatcher(std::weak_ptr<Protocol> target) : target_(std::move(target)) {}

    bool serve(std::size_t method, const Array& arguments, IPCReply reply) override {
        const auto target = target_.lock();
        if (!target) return true;
        return rows()[method].call(*target, arguments, std::move(reply));
    }
    bool serveFrame(const IPCFrame& frame) override {
        const auto target = target_.lock();
        return !target || rows()[frame.method].callWithFrame(*target, frame);
    }

  private:
    struct Row {
        bool (*call)(Protocol&, const Array&, IPCReply);
        bool (*callWithFrame)(Protocol&, const IPCFrame&);
    };
    static const auto& rows() {
        static constexpr auto table = std::apply(
            [](const auto&... messages) {
                return std::array<Row, sizeof...(messages)>{
                    Row{&std::remove_cvref_t<decltype(messages)>::call,
                        &std::remove_cvref_t<decltype(messages)>::callWithFrame}...};
            },
            ProtocolTable<Protocol>::kMessages);
        return table;
    }

    const std::weak_ptr<Protocol> target_;
};

/// Sends a protocol's messages over a connection. Thread-safe, as the connection is.
class RemoteSender {
  public:
    RemoteSender(IPCConnection& connection, std::function<void(const KVError&)> errorHandler)
        : errorHandler_(std::move(errorHandler)),
          remote_(connection.remoteObjectProxyWithErrorHandler(errorHandler_)) {}

    template <auto Member, typename... Arguments>
    void send(const Arguments&... arguments) const {
        using Traits = detail::MemberTraits<decltype(Member)>;
        constexpr std::size_t index = messageIndex<Member>();
        sendSplit<Traits>(index, std::forward_as_tuple(arguments...));
    }

  private:
    template <typename Traits, typename Tuple>
    void sendSplit(std::size_t index, const Tuple& parameters) const {
        constexpr std::size_t count = Traits::Arguments::kSize;
        Array values = encode(typename Traits::Arguments(), parameters, std::make_index_sequence<count>());
        if constexpr (Traits::kHasHandler) {
            remote_->send(
                index, std::move(values),
                detail::decodingReply(typename Traits::Handler(std::get<count>(parameters)), errorHandler_));
        } else {
            remote_->send(index, std::move(values), nullptr);
        }
    }
    template <typename... Types, typename Tuple, std::size_t... Places>
    static Array encode(detail::TypeList<Types...>, const Tuple& parameters, std::index_sequence<Places...>) {
        return {IPCCoding<Types>::encode(std::get<Places>(parameters))...};
    }

    const std::function<void(const KVError&)> errorHandler_;
    const std::shared_ptr<IPCRemoteObject> remote_;
};

}  // namespace kelvo
