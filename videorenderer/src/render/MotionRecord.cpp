// Comparisons of motion records and their image-renderer geometry.

#include "ML/MotionRecord.h"

namespace ML
{

bool SameGeometry(const MotionRecord& inA, const MotionRecord& inB)
{
    return inA.mAnchorX == inB.mAnchorX && inA.mAnchorY == inB.mAnchorY &&
           inA.mPositionX == inB.mPositionX && inA.mPositionY == inB.mPositionY &&
           inA.mScaleX == inB.mScaleX && inA.mScaleY == inB.mScaleY &&
           inA.mRotation == inB.mRotation && inA.mReserved1 == inB.mReserved1 &&
           inA.mReserved3 == inB.mReserved3 && inA.mMediaWidth == inB.mMediaWidth &&
           inA.mMediaHeight == inB.mMediaHeight;
}

bool SameMotion(const MotionRecord& inA, const MotionRecord& inB)
{
    return SameGeometry(inA, inB) && inA.mBlendMode == inB.mBlendMode &&
           inA.mOpacity == inB.mOpacity;
}

IR_MotionGeometry ToMotionGeometry(const MotionRecord& inRecord)
{
    IR_MotionGeometry geometry;
    geometry.anchorX = inRecord.mAnchorX;
    geometry.anchorY = inRecord.mAnchorY;
    geometry.positionX = inRecord.mPositionX;
    geometry.positionY = inRecord.mPositionY;
    geometry.scaleX = inRecord.mScaleX;
    geometry.scaleY = inRecord.mScaleY;
    geometry.rotationDegrees = inRecord.mRotation;
    return geometry;
}

} // namespace ML
