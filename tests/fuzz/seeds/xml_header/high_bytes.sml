<?xml version="1.0" ?>
<HEADER_INFO xmlns="http://www.qorvex.org/xml/QorvexHeaderSchema"
	xmlns:xsi="http://www.w3.org/2001/XMLSchema-instance"
	xsi:schemaLocation="http://www.qorvex.org/xml/QorvexHeaderSchema
	http://www.qorvex.org/xml/QorvexHeaderSchema/QorvexHeaderSchema_version_1.0.xsd">
   <StoreTest>
      <IntScalar>-42</IntScalar>
      <DblScalar>1679.90000000000009094947017729</DblScalar>
      <StrScalar>a####BIGxb…céÃ©</StrScalar>
      <IntVector>
         <VectorInteger NumberOfElements = "3">
            <ValueInteger ID = "0">2147483647</ValueInteger>
            <ValueInteger ID = "1">2147483646</ValueInteger>
            <ValueInteger ID = "2">2147483645</ValueInteger>
         </VectorInteger>
      </IntVector>
      <DblVector>
         <VectorDouble NumberOfElements = "4">
            <ValueDouble ID = "0">0.100000000000000005551115123126</ValueDouble>
            <ValueDouble ID = "1">NaN</ValueDouble>
            <ValueDouble ID = "2">-3.711999999999999696499719537e-05</ValueDouble>
            <ValueDouble ID = "3">5300000000</ValueDouble>
         </VectorDouble>
      </DblVector>
      <StrVector>
         <VectorString NumberOfElements = "2">
            <ValueString ID = "0">HH</ValueString>
            <ValueString ID = "1">&quot;&quot;</ValueString>
         </VectorString>
      </StrVector>
      <IntMatrix>
         <MatrixInteger NumberOfRows = "2" NumberOfColumns = "2">
            <MatrixRowInteger ID = "0">
               <ValueInteger ID = "0">0</ValueInteger>
               <ValueInteger ID = "1">1</ValueInteger>
            </MatrixRowInteger>
            <MatrixRowInteger ID = "1">
               <ValueInteger ID = "0">10</ValueInteger>
               <ValueInteger ID = "1">11</ValueInteger>
            </MatrixRowInteger>
         </MatrixInteger>
      </IntMatrix>
      <DblMatrix>
         <MatrixDouble NumberOfRows = "1" NumberOfColumns = "3">
            <MatrixRowDouble ID = "0">
               <ValueDouble ID = "0">9591</ValueDouble>
               <ValueDouble ID = "1">35000.5</ValueDouble>
               <ValueDouble ID = "2">310</ValueDouble>
            </MatrixRowDouble>
         </MatrixDouble>
      </DblMatrix>
      <StrMatrix>
         <MatrixString NumberOfRows = "1" NumberOfColumns = "2">
            <MatrixRowString ID = "0">
               <ValueString ID = "0">ORIGIN DATA</ValueString>
               <ValueString ID = "1">ers_raw</ValueString>
            </MatrixRowString>
         </MatrixString>
      </StrMatrix>
      <Pair>
         <Struct_Pair NumberOfFields = "2">
            <PairA>1.5</PairA>
            <PairB>-2.25</PairB>
         </Struct_Pair>
      </Pair>
      <Track>
         <VectorOfStructs_Track NumberOfElements = "2" NumberOfFields = "2">
            <VectorOfStructsValues_Track ID = "0">
               <TrackT>0</TrackT>
               <TrackV>7100</TrackV>
            </VectorOfStructsValues_Track>
            <VectorOfStructsValues_Track ID = "1">
               <TrackT>0.5</TrackT>
               <TrackV>7101</TrackV>
            </VectorOfStructsValues_Track>
         </VectorOfStructs_Track>
      </Track>
   </StoreTest>
</HEADER_INFO>
