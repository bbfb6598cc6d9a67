import { NoMember } from '../directory/NoMember';
import { useStored } from '../options/useStored';
import { NEVER } from '../rules/schedule';
import { t } from '../texts';
import { ErrorAlert, Loading, PageHeader } from '../ui';
import { ScheduleForm } from './ScheduleForm';
import { readStored } from './stored';
import { scheduleWords } from './words';

export default function SchedulePage() {
  const { stored, error, loading, reload, onStored } = useStored('schedule', readStored);
  return (
    <div className="vorn-page">
      <PageHeader title={t('schedule.title')} description={t('schedule.intro')} />
      {error !== undefined && <ErrorAlert error={error} title={t('schedule.failed')} onRetry={reload} />}
      {loading && <Loading text={t('schedule.loading')} />}
      {stored?.member === false && (
        <NoMember
          body={
            stored.schedule.date_type === NEVER
              ? t('schedule.noMember')
              : `${t('schedule.noMember')} ${t('schedule.leftOver', { words: scheduleWords(stored.schedule) })}`
          }
        />
      )}
      {stored?.member === true && (
        <ScheduleForm stored={stored.schedule} clock={stored.clock} onStored={onStored} />
      )}
    </div>
  );
}
