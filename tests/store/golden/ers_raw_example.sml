<?xml version="1.0" ?>
<HEADER_INFO xmlns="http://www.qorvex.org/xml/QorvexHeaderSchema"
	xmlns:xsi="http://www.w3.org/2001/XMLSchema-instance"
	xsi:schemaLocation="http://www.qorvex.org/xml/QorvexHeaderSchema
	http://www.qorvex.org/xml/QorvexHeaderSchema/QorvexHeaderSchema_version_1.0.xsd">
   <RegistrationCoordinates>
      <LatNorthing>41.7999999999999971578290569596</LatNorthing>
      <LonEasting>12.5999999999999996447286321199</LonEasting>
   </RegistrationCoordinates>
   <AcquisitionParameters>
      <AzimuthStartTime>15-MAR-1997 09:41:26.189159</AzimuthStartTime>
      <AzimuthStopTime>15-MAR-1997 09:41:42.856795</AzimuthStopTime>
   </AcquisitionParameters>
   <ChannelInfo>
      <Description>
         <VectorString NumberOfElements = "1">
            <ValueString ID = "0">VV</ValueString>
         </VectorString>
      </Description>
      <CarrierFrequency>
         <VectorDouble NumberOfElements = "1">
            <ValueDouble ID = "0">5300000000</ValueDouble>
         </VectorDouble>
      </CarrierFrequency>
      <SamplingRate>
         <VectorDouble NumberOfElements = "1">
            <ValueDouble ID = "0">18960000</ValueDouble>
         </VectorDouble>
      </SamplingRate>
      <PulseDuration>
         <VectorDouble NumberOfElements = "1">
            <ValueDouble ID = "0">3.711999999999999696499719537e-05</ValueDouble>
         </VectorDouble>
      </PulseDuration>
      <BandWidth>
         <VectorDouble NumberOfElements = "1">
            <ValueDouble ID = "0">15550000</ValueDouble>
         </VectorDouble>
      </BandWidth>
      <PRF>
         <VectorDouble NumberOfElements = "1">
            <ValueDouble ID = "0">1679.9023939999999583960743621</ValueDouble>
         </VectorDouble>
      </PRF>
      <PRFExtracted>
         <VectorDouble NumberOfElements = "1">
            <ValueDouble ID = "0">1679.9023939999999583960743621</ValueDouble>
         </VectorDouble>
      </PRFExtracted>
      <IncidenceAngle>23</IncidenceAngle>
   </ChannelInfo>
   <Sensor>
      <SensorName>ERS-2</SensorName>
      <Spectrum>NORMAL</Spectrum>
      <Baseband>YES</Baseband>
      <Chirp>UP_CHIRP</Chirp>
      <SamplingMode>IQ</SamplingMode>
      <AzimuthAngle>90</AzimuthAngle>
   </Sensor>
   <sar_processing>
      <FirstPixel>0</FirstPixel>
   </sar_processing>
   <RasterInfo>
      <NrOfPixelsPerLine>5616</NrOfPixelsPerLine>
      <NrOfLinesPerImage>28000</NrOfLinesPerImage>
      <CellType>UBYTE_COMPLEX</CellType>
      <DataUnits>ERS RAW</DataUnits>
      <BytesOrder>MSBF</BytesOrder>
      <HeaderOffset>11644</HeaderOffset>
      <RowPrefix>412</RowPrefix>
      <RowSuffix>0</RowSuffix>
      <FooterLen>0</FooterLen>
      <NullCellValue>-9999</NullCellValue>
      <GeocodedImage>NotOK</GeocodedImage>
      <OtherInfo>
         <MatrixString NumberOfRows = "2" NumberOfColumns = "2">
            <MatrixRowString ID = "0">
               <ValueString ID = "0">ORIGIN DATA</ValueString>
               <ValueString ID = "1">ers_raw</ValueString>
            </MatrixRowString>
            <MatrixRowString ID = "1">
               <ValueString ID = "0">SOFTWARE</ValueString>
               <ValueString ID = "1">Qorvex Base ENVI  4.3.000Jan 13 2011 </ValueString>
            </MatrixRowString>
         </MatrixString>
      </OtherInfo>
   </RasterInfo>
   <Processing>
      <SlantRange>
         <VectorDouble NumberOfElements = "3">
            <ValueDouble ID = "0">841302.863600000040605664253235</ValueDouble>
            <ValueDouble ID = "1">863498.731897336547262966632843</ValueDouble>
            <ValueDouble ID = "2">885694.600194673053920269012451</ValueDouble>
         </VectorDouble>
      </SlantRange>
      <FastTime>
         <VectorDouble NumberOfElements = "3">
            <ValueDouble ID = "0">0.00561256856968696694193399210349</ValueDouble>
            <ValueDouble ID = "1">0.0057606434642017345301723274531</ValueDouble>
            <ValueDouble ID = "2">0.00590871835871650298577240079112</ValueDouble>
         </VectorDouble>
      </FastTime>
      <PixelSpacingRg>7.90591925105485238134406245081</PixelSpacingRg>
      <PixelSpacingAz>3.979999999999999982236431606</PixelSpacingAz>
      <NRangeLooks>1</NRangeLooks>
      <NAzimuthLooks>1</NAzimuthLooks>
      <ProcessingVelocity>
         <VectorDouble NumberOfElements = "1">
            <ValueDouble ID = "0">7109.5</ValueDouble>
         </VectorDouble>
      </ProcessingVelocity>
   </Processing>
   <InitialGeometry>
      <Projection>SLANT_RANGE</Projection>
      <TimeDirectionLines>INCREASE TIME DIRECTION</TimeDirectionLines>
      <TimeDirectionPixel>INCREASE TIME DIRECTION</TimeDirectionPixel>
      <ReferenceHeight>0</ReferenceHeight>
   </InitialGeometry>
   <StateVectorData>
      <nStateVectors>9</nStateVectors>
      <StateVectorReference>ECR</StateVectorReference>
      <TimeFirst>15-MAR-1997 09:40:27.000000</TimeFirst>
      <TimeDelta>15</TimeDelta>
      <pos_x>
         <VectorDouble NumberOfElements = "9">
            <ValueDouble ID = "0">4868583.66799999959766864776611</ValueDouble>
            <ValueDouble ID = "1">4950005.57000000029802322387695</ValueDouble>
            <ValueDouble ID = "2">5030209.22599999979138374328613</ValueDouble>
            <ValueDouble ID = "3">5109173.94400000013411045074463</ValueDouble>
            <ValueDouble ID = "4">5186879.34900000039488077163696</ValueDouble>
            <ValueDouble ID = "5">5263305.38100000005215406417847</ValueDouble>
            <ValueDouble ID = "6">5338432.30599999986588954925537</ValueDouble>
            <ValueDouble ID = "7">5412240.71999999973922967910767</ValueDouble>
            <ValueDouble ID = "8">5484711.55200000014156103134155</ValueDouble>
         </VectorDouble>
      </pos_x>
      <pos_y>
         <VectorDouble NumberOfElements = "9">
            <ValueDouble ID = "0">1513449.89599999994970858097076</ValueDouble>
            <ValueDouble ID = "1">1508449.91100000008009374141693</ValueDouble>
            <ValueDouble ID = "2">1502905.4080000000540167093277</ValueDouble>
            <ValueDouble ID = "3">1496820.43999999994412064552307</ValueDouble>
            <ValueDouble ID = "4">1490199.23699999996460974216461</ValueDouble>
            <ValueDouble ID = "5">1483046.20500000007450580596924</ValueDouble>
            <ValueDouble ID = "6">1475365.92299999995157122612</ValueDouble>
            <ValueDouble ID = "7">1467163.14100000006146728992462</ValueDouble>
            <ValueDouble ID = "8">1458442.78000000002793967723846</ValueDouble>
         </VectorDouble>
      </pos_y>
      <pos_z>
         <VectorDouble NumberOfElements = "9">
            <ValueDouble ID = "0">5017973.35199999995529651641846</ValueDouble>
            <ValueDouble ID = "1">4939336.30599999986588954925537</ValueDouble>
            <ValueDouble ID = "2">4859489.23799999989569187164307</ValueDouble>
            <ValueDouble ID = "3">4778451.75700000021606683731079</ValueDouble>
            <ValueDouble ID = "4">4696243.75999999977648258209229</ValueDouble>
            <ValueDouble ID = "5">4612885.4320000000298023223877</ValueDouble>
            <ValueDouble ID = "6">4528397.23799999989569187164307</ValueDouble>
            <ValueDouble ID = "7">4442799.91799999959766864776611</ValueDouble>
            <ValueDouble ID = "8">4356114.48400000017136335372925</ValueDouble>
         </VectorDouble>
      </pos_z>
      <vel_x>
         <VectorDouble NumberOfElements = "9">
            <ValueDouble ID = "0">5468.27000000000043655745685101</ValueDouble>
            <ValueDouble ID = "1">5387.75</ValueDouble>
            <ValueDouble ID = "2">5305.8410000000003492459654808</ValueDouble>
            <ValueDouble ID = "3">5222.56199999999989813659340143</ValueDouble>
            <ValueDouble ID = "4">5137.9359999999996944097802043</ValueDouble>
            <ValueDouble ID = "5">5051.9830000000001746229827404</ValueDouble>
            <ValueDouble ID = "6">4964.72500000000036379788070917</ValueDouble>
            <ValueDouble ID = "7">4876.18500000000040017766878009</ValueDouble>
            <ValueDouble ID = "8">4786.3850000000002182787284255</ValueDouble>
         </VectorDouble>
      </vel_x>
      <vel_y>
         <VectorDouble NumberOfElements = "9">
            <ValueDouble ID = "0">-315.095000000000027284841053188</ValueDouble>
            <ValueDouble ID = "1">-351.526999999999986812326824293</ValueDouble>
            <ValueDouble ID = "2">-387.694999999999993178789736703</ValueDouble>
            <ValueDouble ID = "3">-423.586999999999989086063578725</ValueDouble>
            <ValueDouble ID = "4">-459.190999999999974079400999472</ValueDouble>
            <ValueDouble ID = "5">-494.495999999999980900611262769</ValueDouble>
            <ValueDouble ID = "6">-529.489000000000032741809263825</ValueDouble>
            <ValueDouble ID = "7">-564.159999999999968167685437948</ValueDouble>
            <ValueDouble ID = "8">-598.498000000000047293724492192</ValueDouble>
         </VectorDouble>
      </vel_y>
      <vel_z>
         <VectorDouble NumberOfElements = "9">
            <ValueDouble ID = "0">-5201.70499999999992724042385817</ValueDouble>
            <ValueDouble ID = "1">-5283.02000000000043655745685101</ValueDouble>
            <ValueDouble ID = "2">-5363.03799999999955616658553481</ValueDouble>
            <ValueDouble ID = "3">-5441.73899999999957799445837736</ValueDouble>
            <ValueDouble ID = "4">-5519.10300000000006548361852765</ValueDouble>
            <ValueDouble ID = "5">-5595.11300000000028376234695315</ValueDouble>
            <ValueDouble ID = "6">-5669.74899999999979627318680286</ValueDouble>
            <ValueDouble ID = "7">-5742.9930000000003929017111659</ValueDouble>
            <ValueDouble ID = "8">-5814.82800000000042928149923682</ValueDouble>
         </VectorDouble>
      </vel_z>
   </StateVectorData>
</HEADER_INFO>
