#pragma once

#include "ironmoat/values.h"
#include "records/keyed_record.h"
#include "records/payload_parts.h"
#include "records/web_tunnel.h"

namespace ironmoat {

/// A message payload, as it comes: a top-level record, and the element of its own two lists.
struct VeskCorvelProtocolPayload {
  using CodingKeys = records::CodingKeys<VeskCorvelProtocolPayload>;

  Int command = 0;
  Optional<Int> commandContext;
  Optional<Int> version;
  Optional<Data> payload;
  Optional<Data> bulkedPayload;
  Optional<Data> fanoutPayload;
  Optional<Data> additionalPayload;
  Optional<Data> payloadMetadata;
  Optional<String> messageId;
  Optional<Data> messageUUID;
  Optional<String> queueId;
  Optional<Bool> deliveryStatus;
  Optional<VeskCorvelProtocolDeliveryContext> deliveryContext;
  Optional<Int> certifiedDeliveryVersion;
  Optional<Data> certifiedDeliveryRts;
  Optional<Bool> noResponseNeeded;
  Optional<Bool> generateDeliveryReceipt;
  Optional<Data> sessionToken;
  Optional<Data> dommelSessionToken;
  Optional<String> destinationId;
  Optional<String> userAgent;
  Optional<String> KibbOwnerId;
  Optional<Data> KibbFileSignature;
  Optional<Int64> KibbFileLength;
  Optional<String> KibbAuthToken;
  Optional<String> KibbAuthUrl;
  Optional<String> KibbAuthId;
  Optional<List<String>> KibbDownloadAuthList;
  Optional<List<String>> KibbDownloadUrlList;
  Optional<String> KibbDownloadUrl;
  Optional<String> KibbUploadUrl;
  Optional<Int64> KibbExpiryNanos;
  Optional<Int> contentVersion;
  Optional<String> contentHeaders;
  Optional<Data> contentBody;
  Optional<Data> contentReferenceSignature;
  Optional<Int> attachmentSize;
  Optional<Data> token;
  Optional<String> senderId;
  Optional<String> senderOpaqueId;
  Optional<String> mspId;
  Optional<Int> responseStatus;
  Optional<Int64> epochTimeNanos;
  Optional<Int64> originalEpochTimeNanos;
  Optional<Int> failReason;
  Optional<Data> failMessageId;
  Optional<String> failMessageIdString;
  Optional<Int> failDownloadAttachmentSize;
  Optional<Int> failUploadAttachmentSize;
  Optional<String> failReasonMessage;
  Optional<Int64> failTimeElapsed;
  Optional<String> encryptionType;
  Optional<Int> storageFlags;
  Optional<Int> priority;
  Optional<Int> senderExpectsAck;
  Optional<List<VeskCorvelProtocolPayload>> dstIdTokenList;
  Optional<List<VeskCorvelProtocolPayload>> corvelMessageList;
  Optional<Int> storageCheckVersion;
  Optional<Int64> dateExpirationSeconds;
  Optional<Int> corvelProtocol;
  Optional<Bool> internalBuild;
  Optional<Bool> loggingProfile;
  Optional<Bool> traceProfile;
  Optional<Bool> groupMessage;
  Optional<String> contentType;
  Optional<String> adhocServiceOverride;
  Optional<Data> responseIdentifier;
  Optional<String> responseIdentifierString;
  Optional<String> strictTransportSecurity;
  Optional<String> traceId;
  Optional<String> splunkHint;
  Optional<String> asHttpHeader;
  Optional<Int> dommelDeliveryStatus;
  Optional<String> dommelReportId;
  Optional<Int> retryCount;
  Optional<String> testOptions;
  Optional<Int> fanoutChunkNumber;
  Optional<Bool> fanoutLastChunk;
  Optional<String> url;
  Optional<Int> parloRetryCount;
  Optional<Int> webtunnelVersion;
  Optional<String> httpUrl;
  Optional<VeskCorvelProtocolHttpHeaders> httpHeaders;
  Optional<Data> httpBody;
  Optional<String> httpBodyUrl;
  Optional<Data> httpBodyKey;
  Optional<Int> httpResponseStatus;
  Optional<String> httpErrorMsg;
  Optional<Bool> writeToNimbra;
  Optional<Bool> pessimisticCheck;
  Optional<Bool> unfilteredHeaders;
  Optional<Int> deliveryStatusFlags;
  Optional<String> conferenceURI;
  Optional<Data> selfSessionToken;
  Optional<Data> queryHash;
  Optional<Int> testDropPoint;
  Optional<Bool> userPlusOne;
  Optional<Bool> isInitiatorKey;
  Optional<Int> errorCode;
  Optional<Bool> messageCheckpoint;
  Optional<Int> conversationId;
  Optional<Int> protocolVersion;
  Optional<String> applicationId;
  Optional<Int> reason;
  Optional<Int> prevErrorCode;
  Optional<Data> prevAccessToken;
  Optional<Data> prevRelayIp;
  Optional<Int> prevTimestamp;
  Optional<Data> activeAccessToken;
  Optional<Data> activeRelayIp;
  Optional<Int> selfAllocTokenCountOld;
  Optional<Int> selfAllocTokenCount;
  Optional<List<VeskHoplinePluginRequest>> pluginRequests;
  Optional<String> pluginName;
  Optional<String> pluginConfig;
  Optional<Int> pluginStream;
  Optional<Bool> pluginDevMode;
  Optional<Bool> hoplineNewSession;
  Optional<Int> requestType;
  Optional<Data> veskSessionId;
  Optional<Int> relayProvider;
  Optional<Bool> sharedSession;
  Optional<String> groupId;
  Optional<Int> groupMemberCount;
  Optional<Int> allocateInfoAttribute;
  Optional<Data> relayIp;
  Optional<Data> relayIpv6;
  Optional<Int> relayPort;
  Optional<Data> relayAccessToken;
  Optional<Data> relaySessionKey;
  Optional<Data> relaySessionId;
  Optional<Int64> expiryEpochTimeMillis;
  Optional<Data> initiatorIp;
  Optional<Int64> participantId;
  Optional<Data> softwareVersion;
  Optional<String> relayBuildVersion;
  Optional<Int64> allocationEpochTimeMillis;
  Optional<Int> allocationStatus;
  Optional<List<VeskHoplineAllocationStatus>> allocationStatuses;
  Optional<List<VeskHoplineSelfAllocToken>> selfAllocTokenList;
  Optional<Data> relayReportingBlob;
  Optional<Int> relayServerType;
  Optional<List<VeskHoplinePluginAllocation>> pluginAllocations;
  Optional<Int> hoplineErrorCode;
  Optional<Int> originalCommand;
  Optional<Bool> isBulkedPayload;
  Optional<Bool> wantsAppAck;
  Optional<String> errorDomain;
  Optional<Bool> expectsPeerResponse;
  Optional<Int> allowGDR;

  [[nodiscard]] bool decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};

template <>
struct records::Table<VeskCorvelProtocolPayload> {
  using R = VeskCorvelProtocolPayload;
  static constexpr KeyTable rows{
      row<&R::command>("c"),
      row<&R::commandContext>("cc"),
      row<&R::version>("v"),
      row<&R::payload>("P"),
      row<&R::bulkedPayload>("N"),
      row<&R::fanoutPayload>("fP"),
      row<&R::additionalPayload>("aP"),
      row<&R::payloadMetadata>("Pm"),
      row<&R::messageId>("i"),
      row<&R::messageUUID>("U"),
      row<&R::queueId>("qI"),
      row<&R::deliveryStatus>("D"),
      row<&R::deliveryContext>("Dc"),
      row<&R::certifiedDeliveryVersion>("cdv"),
      row<&R::certifiedDeliveryRts>("cdr"),
      row<&R::noResponseNeeded>("nr"),
      row<&R::generateDeliveryReceipt>("gd"),
      row<&R::sessionToken>("sT"),
      row<&R::dommelSessionToken>("hT"),
      row<&R::destinationId>("tP"),
      row<&R::userAgent>("ua"),
      row<&R::KibbOwnerId>("mO"),
      row<&R::KibbFileSignature>("mS"),
      row<&R::KibbFileLength>("mL"),
      row<&R::KibbAuthToken>("mA"),
      row<&R::KibbAuthUrl>("mR"),
      row<&R::KibbAuthId>("mU"),
      row<&R::KibbDownloadAuthList>("dal"),
      row<&R::KibbDownloadUrlList>("dul"),
      row<&R::KibbDownloadUrl>("dR"),
      row<&R::KibbUploadUrl>("uR"),
      row<&R::KibbExpiryNanos>("mX"),
      row<&R::contentVersion>("cV"),
      row<&R::contentHeaders>("cH"),
      row<&R::contentBody>("cB"),
      row<&R::contentReferenceSignature>("cR"),
      row<&R::attachmentSize>("mT"),
      row<&R::token>("t"),
      row<&R::senderId>("sP"),
      row<&R::senderOpaqueId>("sI"),
      row<&R::mspId>("mP"),
      row<&R::responseStatus>("s"),
      row<&R::epochTimeNanos>("e"),
      row<&R::originalEpochTimeNanos>("oe"),
      row<&R::failReason>("fR"),
      row<&R::failMessageId>("fU"),
      row<&R::failMessageIdString>("fM"),
      row<&R::failDownloadAttachmentSize>("fFS"),
      row<&R::failUploadAttachmentSize>("fS"),
      row<&R::failReasonMessage>("fRM"),
      row<&R::failTimeElapsed>("fTE"),
      row<&R::encryptionType>("E"),
      row<&R::storageFlags>("H"),
      row<&R::priority>("pri"),
      row<&R::senderExpectsAck>("ack"),
      row<&R::dstIdTokenList>("dtl"),
      row<&R::corvelMessageList>("mml"),
      row<&R::storageCheckVersion>("scv"),
      row<&R::dateExpirationSeconds>("eX"),
      row<&R::corvelProtocol>("xp"),
      row<&R::internalBuild>("x-internal"),
      row<&R::loggingProfile>("x-logging"),
      row<&R::traceProfile>("x-trace"),
      row<&R::groupMessage>("gm"),
      row<&R::contentType>("cT"),
      row<&R::adhocServiceOverride>("aS"),
      row<&R::responseIdentifier>("rI"),
      row<&R::responseIdentifierString>("ri"),
      row<&R::strictTransportSecurity>("strict-transport-security"),
      row<&R::traceId>("x-b3-traceid"),
      row<&R::splunkHint>("sh"),
      row<&R::asHttpHeader>("as"),
      row<&R::dommelDeliveryStatus>("hD"),
      row<&R::dommelReportId>("hI"),
      row<&R::retryCount>("rc"),
      row<&R::testOptions>("x-test-opts"),
      row<&R::fanoutChunkNumber>("fcn"),
      row<&R::fanoutLastChunk>("flc"),
      row<&R::url>("url"),
      row<&R::parloRetryCount>("frc"),
      row<&R::webtunnelVersion>("wV"),
      row<&R::httpUrl>("u"),
      row<&R::httpHeaders>("h"),
      row<&R::httpBody>("b"),
      row<&R::httpBodyUrl>("bu"),
      row<&R::httpBodyKey>("bk"),
      row<&R::httpResponseStatus>("hs"),
      row<&R::httpErrorMsg>("hr"),
      row<&R::writeToNimbra>("ck"),
      row<&R::pessimisticCheck>("x-pessimistic"),
      row<&R::unfilteredHeaders>("nH"),
      row<&R::deliveryStatusFlags>("O"),
      row<&R::conferenceURI>("curi"),
      row<&R::selfSessionToken>("sst"),
      row<&R::queryHash>("qH"),
      row<&R::testDropPoint>("x-dp"),
      row<&R::userPlusOne>("up1"),
      row<&R::isInitiatorKey>("is-initiator-key"),
      row<&R::errorCode>("eC"),
      row<&R::messageCheckpoint>("mc"),
      row<&R::conversationId>("ci"),
      row<&R::protocolVersion>("qv"),
      row<&R::applicationId>("qai"),
      row<&R::reason>("qr"),
      row<&R::prevErrorCode>("qpec"),
      row<&R::prevAccessToken>("qpat"),
      row<&R::prevRelayIp>("qpip"),
      row<&R::prevTimestamp>("qpt"),
      row<&R::activeAccessToken>("qaat"),
      row<&R::activeRelayIp>("qaip"),
      row<&R::selfAllocTokenCountOld>("qsatc"),
      row<&R::selfAllocTokenCount>("qsats"),
      row<&R::pluginRequests>("qplr"),
      row<&R::pluginName>("qpln"),
      row<&R::pluginConfig>("qplc"),
      row<&R::pluginStream>("qpls"),
      row<&R::pluginDevMode>("qpld"),
      row<&R::hoplineNewSession>("qns"),
      row<&R::requestType>("qat"),
      row<&R::veskSessionId>("qvesk"),
      row<&R::relayProvider>("qrpr"),
      row<&R::sharedSession>("qrss"),
      row<&R::groupId>("qgid"),
      row<&R::groupMemberCount>("qgmc"),
      row<&R::allocateInfoAttribute>("qia"),
      row<&R::relayIp>("qrip"),
      row<&R::relayIpv6>("qrip6"),
      row<&R::relayPort>("qrp"),
      row<&R::relayAccessToken>("qrst"),
      row<&R::relaySessionKey>("qrsk"),
      row<&R::relaySessionId>("qrsi"),
      row<&R::expiryEpochTimeMillis>("qe"),
      row<&R::initiatorIp>("qsi"),
      row<&R::participantId>("qri"),
      row<&R::softwareVersion>("qswv"),
      row<&R::relayBuildVersion>("qrbv"),
      row<&R::allocationEpochTimeMillis>("qsat"),
      row<&R::allocationStatus>("qrs"),
      row<&R::allocationStatuses>("qal"),
      row<&R::selfAllocTokenList>("qsatv"),
      row<&R::relayReportingBlob>("qrep"),
      row<&R::relayServerType>("qrast"),
      row<&R::pluginAllocations>("qpla"),
      row<&R::hoplineErrorCode>("qec"),
      row<&R::originalCommand>("oC"),
      row<&R::isBulkedPayload>("iB"),
      row<&R::wantsAppAck>("wA"),
      row<&R::errorDomain>("eD"),
      row<&R::expectsPeerResponse>("eR"),
      row<&R::allowGDR>("gdr"),
  };
};

}  // namespace ironmoat
