#include "boxlib/item/item.h"

#include "boxlib/core/bits.h"

namespace {

MbxStatus freeExtent(MbxContext* context, MbxIlocExtent* extent) {
    return MbxFreeBox(context, extent);
}

MbxStatus freeItem(MbxContext* context, MbxIlocItem* item) {
    return MbxFreeBox(context, item, [&] { return MbxFreeList(context, &item->extents, freeExtent); });
}

MbxStatus freeItemData(MbxContext* context, MbxItemData* data) {
    return MbxFreeBox(context, data, [&] {
        MbxBufferRelease(context, &data->bytes);
        return MBX_OK;
    });
}

MbxStatus freeHandler(MbxContext* context, MbxHandler* handler) {
    return MbxFreeBox(context, handler, [&] {
        MbxBufferRelease(context, &handler->name);
        return MBX_OK;
    });
}

MbxStatus freeXmlParams(MbxContext* context, MbxXmlParams* params) {
    return MbxFreeBox(context, params, [&] {
        MbxBufferRelease(context, &params->text);
        return MBX_OK;
    });
}

MbxStatus freeIlocParams(MbxContext* context, MbxIlocParams* params) {
    return MbxFreeBox(context, params, [&] { return MbxFreeList(context, &params->items, freeItem); });
}

MbxStatus freeIdatParams(MbxContext* context, MbxIdatParams* params) {
    return MbxFreeBox(context, params, [&] { return MbxFreeList(context, &params->ranges, freeItemData); });
}

bool isFieldSize(uint32_t size) {
    return size == 0 || size == 4 || size == 8;
}

// The size of an extent's index, which only version 1 has.
uint32_t indexSize(const MbxIlocParams& params) {
    return params.version == 1 ? params.indexSize : 0;
}

MbxStatus writeExtent(MbxContext* context, MbxFile* file, const MbxIlocParams& params,
                      const MbxIlocExtent& extent, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut(&bytes, extent.index, indexSize(params));   // unsigned int(index_size * 8) extent_index
    MbxPut(&bytes, extent.offset, params.offsetSize);  // unsigned int(offset_size * 8) extent_offset
    MbxPut(&bytes, extent.length, params.lengthSize);  // unsigned int(length_size * 8) extent_length
    return MbxWriteComposed(context, file, &bytes, accumulated);
}

MbxStatus writeItem(MbxContext* context, MbxFile* file, const MbxIlocParams& params, const MbxIlocItem& item,
                    uint64_t* accumulated) {
    uint32_t extents = 0;
    MBX_TRY(MbxListCountUpTo(&item.extents, UINT16_MAX, &extents));
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPut16(&bytes, item.itemId);  // unsigned int(16) item_ID
    if (params.version == 1) {
        // unsigned int(12) reserved = 0, unsigned int(4) construction_method
        MbxPut16(&bytes, item.constructionMethod & 0xFU);
    }
    MbxPut16(&bytes, item.dataReferenceIndex);               // unsigned int(16) data_reference_index
    MbxPut(&bytes, item.baseOffset, params.baseOffsetSize);  // unsigned int(base_offset_size * 8) base_offset
    MbxPut16(&bytes, extents);                               // unsigned int(16) extent_count
    MBX_TRY(MbxWriteComposed(context, file, &bytes, accumulated));
    for (const MbxIlocExtent* extent = item.extents.first; extent != nullptr; extent = extent->next) {
        MBX_TRY(writeExtent(context, file, params, *extent, accumulated));
    }
    return MBX_OK;
}

}  // namespace

MbxStatus MbxFreeMetaParams(MbxContext* context, MbxMetaParams* params) {
    return MbxFreeBox(context, params, [&] {
        MBX_TRY(freeHandler(context, params->handler));
        MBX_TRY(freeXmlParams(context, params->xml));
        MBX_TRY(freeIlocParams(context, params->iloc));
        return freeIdatParams(context, params->idat);
    });
}

MbxStatus MbxBuildXml(MbxContext* context, const MbxOptions* options, const MbxXmlParams* params,
                      MbxXmlBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = params;
    return MbxMeasureBox(context, options, box, MbxWriteXmlPayload);
}

// 8.11.2 XML Box
MbxStatus MbxWriteXmlPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxXmlBox* box,
                             uint64_t* written, uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteBuffer(context, file, &box->params->text, &count));  // string xml
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteXmlBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                         const MbxXmlBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("xml "), box, MbxWriteXmlPayload,
                               written, accumulated);
}

MbxStatus MbxFreeXml(MbxContext* context, MbxXmlBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildIloc(MbxContext* context, const MbxOptions* options, const MbxIlocParams* params,
                       MbxIlocBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = params;
    return MbxMeasureBox(context, options, box, MbxWriteIlocPayload);
}

// 8.11.3 Item Location Box
MbxStatus MbxWriteIlocPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxIlocBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    const MbxIlocParams& params = *box->params;
    if (!isFieldSize(params.offsetSize) || !isFieldSize(params.lengthSize) ||
        !isFieldSize(params.baseOffsetSize) || !isFieldSize(indexSize(params))) {
        return MBX_ERR_INTERNAL;
    }
    uint32_t items = 0;
    MBX_TRY(MbxListCountUpTo(&params.items, UINT16_MAX, &items));
    uint64_t sizes = 0;
    MbxPutBits(&sizes, 4, params.offsetSize);      // unsigned int(4) offset_size
    MbxPutBits(&sizes, 4, params.lengthSize);      // unsigned int(4) length_size
    MbxPutBits(&sizes, 4, params.baseOffsetSize);  // unsigned int(4) base_offset_size
    MbxPutBits(&sizes, 4, indexSize(params));      // unsigned int(4) index_size, or reserved
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, params.version, 0);
    MbxPut(&bytes, sizes, 2);
    MbxPut16(&bytes, items);  // unsigned int(16) item_count
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    for (const MbxIlocItem* item = params.items.first; item != nullptr; item = item->next) {
        MBX_TRY(writeItem(context, file, params, *item, &count));
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteIlocBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxIlocBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("iloc"), box, MbxWriteIlocPayload,
                               written, accumulated);
}

MbxStatus MbxFreeIloc(MbxContext* context, MbxIlocBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildIdat(MbxContext* context, const MbxOptions* options, const MbxIdatParams* params,
                       MbxIdatBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    box->params = params;
    return MbxMeasureBox(context, options, box, MbxWriteIdatPayload);
}

// 8.11.11 Item Data Box
MbxStatus MbxWriteIdatPayload(MbxContext* context, MbxFile* file, uint64_t position, const MbxIdatBox* box,
                              uint64_t* written, uint64_t* accumulated) {
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    for (const MbxItemData* range = box->params->ranges.first; range != nullptr; range = range->next) {
        MBX_TRY(MbxWriteBuffer(context, file, &range->bytes, &count));  // bit(8) data[]
    }
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteIdatBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxIdatBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("idat"), box, MbxWriteIdatPayload,
                               written, accumulated);
}

MbxStatus MbxFreeIdat(MbxContext* context, MbxIdatBox* box) {
    return MbxFreeBox(context, box);
}

MbxStatus MbxBuildMeta(MbxContext* context, const MbxOptions* options, const MbxMetaParams* params,
                       MbxMetaBox* box) {
    if (MbxAnyNull(context, options, params, box)) return MBX_ERR_INVALID_ARG;
    MBX_TRY(MbxMakeBox(context, options, &box->hdlr, params->handler, MbxBuildHdlr, MbxFreeHdlr));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->xml, params->xml, MbxBuildXml, MbxFreeXml));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->iloc, params->iloc, MbxBuildIloc, MbxFreeIloc));
    MBX_TRY(MbxMakeOptionalBox(context, options, &box->idat, params->idat, MbxBuildIdat, MbxFreeIdat));
    return MbxMeasureBox(context, options, box, MbxWriteMetaPayload);
}

// 8.11.1 Meta Box
MbxStatus MbxWriteMetaPayload(MbxContext* context, const MbxOptions* options, MbxFile* file,
                              uint64_t position, const MbxMetaBox* box, uint64_t* written,
                              uint64_t* accumulated) {
    MbxBytes bytes;
    MbxBeginBytes(context, &bytes);
    MbxPutVersionFlags(&bytes, 0, 0);
    uint64_t count = 0;
    MBX_TRY(MbxSeek(context, file, position));
    MBX_TRY(MbxWriteComposed(context, file, &bytes, &count));
    MBX_TRY(MbxWriteHdlrBox(context, options, file, position + count, box->hdlr, nullptr, &count));
    MBX_TRY(MbxWriteXmlBox(context, options, file, position + count, box->xml, nullptr, &count));
    MBX_TRY(MbxWriteIlocBox(context, options, file, position + count, box->iloc, nullptr, &count));
    MBX_TRY(MbxWriteIdatBox(context, options, file, position + count, box->idat, nullptr, &count));
    return MbxReportBytes(count, written, accumulated);
}

MbxStatus MbxWriteMetaBox(MbxContext* context, const MbxOptions* options, MbxFile* file, uint64_t position,
                          const MbxMetaBox* box, uint64_t* written, uint64_t* accumulated) {
    return MbxWriteOptionalBox(context, options, file, position, MbxCode("meta"), box, MbxWriteMetaPayload,
                               written, accumulated);
}

MbxStatus MbxFreeMeta(MbxContext* context, MbxMetaBox* box) {
    return MbxFreeBox(context, box, [&] {
        MBX_TRY(MbxFreeHdlr(context, box->hdlr));
        MBX_TRY(MbxFreeXml(context, box->xml));
        MBX_TRY(MbxFreeIloc(context, box->iloc));
        return MbxFreeIdat(context, box->idat);
    });
}
