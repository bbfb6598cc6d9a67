import { Alert } from '@patternfly/react-core/dist/esm/components/Alert';
import { ExpandableSection } from '@patternfly/react-core/dist/esm/components/ExpandableSection';
import { useEffect, useRef } from 'react';
import { t } from '../texts';
import { ErrorAlert } from '../ui';
import type { Job } from './job';
import { Leftovers } from './Leftovers';
import { StepList } from './StepList';

// Why a join or leave failed, what to try, the steps, and what could not be put back. Takes the focus.
export function Failure({ job }: { job: Extract<Job, { state: 'failed' }> }) {
  const { action, record, error } = job;
  const place = useRef<HTMLDivElement>(null);
  useEffect(() => {
    place.current?.focus();
  }, []);

  const steps = record === null ? undefined : <StepList steps={record.steps} />;
  const putBack = action === 'join' && record !== null && record.leftovers.length === 0;
  return (
    <div ref={place} tabIndex={-1} className="vorn-failure">
      {error !== undefined ? (
        <ErrorAlert error={error} title={t(`${action}.failed`)} details={steps} />
      ) : (
        <div role="alert">
          <Alert
            isInline
            variant="danger"
            component="p"
            title={
              record === null
                ? t(`${action}.unknownEnd`)
                : t(`${action}.failedWithout`, { message: record.message })
            }
          >
            {record === null && <p>{t('join.unknownEnd.body')}</p>}
            {steps !== undefined && (
              <ExpandableSection toggleText={t('common.details')}>{steps}</ExpandableSection>
            )}
          </Alert>
        </div>
      )}
      {putBack && <p className="vorn-failure__note">{t('join.putBack')}</p>}
      {record !== null && <Leftovers items={record.leftovers} />}
      {action === 'join' && <p className="vorn-failure__note">{t('join.passwordAgain')}</p>}
    </div>
  );
}
