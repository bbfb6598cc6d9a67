import { call } from '../api/client';
import { t } from '../texts';
import { ErrorAlert, Loading, PageHeader } from '../ui';
import { OptionsForm } from './OptionsForm';
import { useStored } from './useStored';

export default function OptionsPage() {
  const { stored, error, loading, reload, onStored } = useStored('options', (options) =>
    call('conf.get', {}, options),
  );
  return (
    <div className="vorn-page">
      <PageHeader title={t('options.title')} description={t('options.intro')} />
      {error !== undefined && <ErrorAlert error={error} title={t('options.failed')} onRetry={reload} />}
      {loading && <Loading text={t('options.loading')} />}
      {stored !== undefined && <OptionsForm stored={stored} onStored={onStored} />}
    </div>
  );
}
